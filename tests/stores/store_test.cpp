#include "tests/stores/store_test.h"

#include <algorithm>

using namespace KELDOAUTHSERVER;
using support::LogLine;
using support::Row;

namespace {

constexpr char kUnexpected[] = "Unexpected failure[";

bool isStore(const std::string& source) {
  return source == "oauth_clientInfo" || source == "oauth_grantCode" || source == "oauth_token" ||
         source == "oauth_log";
}

std::string entry(const LogLine& line) {
  std::string text = line.priority == 3 ? "" : "<" + std::to_string(line.priority) + ">";
  text += line.source();
  const bool hasFixedNumber = isStore(line.source()) && line.message().rfind(kUnexpected, 0) != 0;
  if (hasFixedNumber) text += ":" + std::to_string(line.number());
  return text + " " + line.message();
}

std::string literal(const std::string& text) {
  std::string quoted = "'";
  for (const char c : text) quoted += c == '\'' ? std::string("''") : std::string(1, c);
  return quoted + "'";
}

/// `columns` wins over `defaults`.
std::string insertion(const std::string& table, const Row& defaults, const Row& columns) {
  Row row = columns;
  row.insert(defaults.begin(), defaults.end());
  std::string names;
  std::string values;
  for (const auto& [name, value] : row) {
    names += (names.empty() ? "" : ", ") + name;
    values += (values.empty() ? "" : ", ") + literal(value);
  }
  return "INSERT INTO " + table + " (" + names + ") VALUES(" + values + ");";
}

}  // namespace

Lines journal() {
  Lines entries;
  for (const LogLine& line : support::SystemLog::lines()) entries.push_back(entry(line));
  return entries;
}

Lines journalOf(const std::string& source) {
  Lines entries;
  for (const std::string& text : journal()) {
    if (text.rfind(source, 0) == 0) entries.push_back(text);
  }
  return entries;
}

::testing::AssertionResult succeeded(const Aftermath& outcome) {
  if (outcome.ok && outcome.code == kCodeBefore && outcome.message == kMessageBefore) {
    return ::testing::AssertionSuccess();
  }
  return ::testing::AssertionFailure()
         << (outcome.ok ? "succeeded" : "failed") << " with " << outcome.code << " \""
         << outcome.message << "\", lines: " << ::testing::PrintToString(outcome.lines);
}

::testing::AssertionResult failed(const Aftermath& outcome, int code, const std::string& message) {
  if (!outcome.ok && outcome.code == code && outcome.message == message) {
    return ::testing::AssertionSuccess();
  }
  return ::testing::AssertionFailure()
         << (outcome.ok ? "succeeded" : "failed") << " with " << outcome.code << " \""
         << outcome.message << "\" in place of " << code << " \"" << message
         << "\", lines: " << ::testing::PrintToString(outcome.lines);
}

::testing::AssertionResult failedSilently(const Aftermath& outcome) {
  return failed(outcome, kCodeBefore, kMessageBefore);
}

std::string cipher(const std::string& text) {
  return "<" + text + ">";
}

void StoreTest::SetUp() {
  World::SetUp();
  support::Platform::useReadableCipher();
  Statements::watch();
  const OAUTHDBLog creates(names::kLogTable);
  support::SystemLog::clear();
}

void StoreTest::TearDown() {
  Statements::watch();
  World::TearDown();
}

std::string StoreTest::insertionOfClient(const Row& columns) {
  return insertion(names::kClientInfoTable,
                   {{"enable", "1"},
                    {"client_id", cipher(support::id64('c'))},
                    {"client_secret", cipher(support::id64('s'))},
                    {"redirect_uri", "app.example/cb"},
                    {"scope", "read"},
                    {"display_name", "App"}},
                   columns);
}

std::string StoreTest::insertionOfCode(const Row& columns) {
  return insertion(names::kGrantCodeTable,
                   {{"username", "alice"},
                    {"client_id", cipher(support::id64('c'))},
                    {"scope", "read"},
                    {"code", support::id64('g')},
                    {"expired_time", "9999999999"},
                    {"state", "xyz"},
                    {"ip", "10.0.0.1"}},
                   columns);
}

std::string StoreTest::insertionOfToken(const Row& columns) {
  return insertion(names::kTokenTable,
                   {{"username", "alice"},
                    {"client_id", cipher(support::id64('c'))},
                    {"scope", "read"},
                    {"refresh_token", support::id64('r')},
                    {"access_token", support::id64('a')},
                    {"expired_time", "9999999999"},
                    {"flow_type", "authorization_code"},
                    {"state", "xyz"},
                    {"ip", "10.0.0.1"}},
                   columns);
}

std::string StoreTest::insertionOfLog(const Row& columns) {
  return insertion(names::kLogTable, {{"timestamp", "1000"}, {"msg", "hello"}}, columns);
}

void StoreTest::insertClient(const Row& columns) {
  sql(insertionOfClient(columns));
}
void StoreTest::insertCode(const Row& columns) {
  sql(insertionOfCode(columns));
}
void StoreTest::insertToken(const Row& columns) {
  sql(insertionOfToken(columns));
}
void StoreTest::insertLog(const Row& columns) {
  sql(insertionOfLog(columns));
}

std::vector<Row> StoreTest::rows(const std::string& table) {
  return sql("SELECT * FROM " + table + " ORDER BY rowid;");
}

Row StoreTest::onlyRow(const std::string& table) {
  const std::vector<Row> all = rows(table);
  EXPECT_EQ(all.size(), 1U) << table;
  return all.empty() ? Row() : all.front();
}

Lines StoreTest::ids(const std::string& table) {
  Lines found;
  for (const Row& row : rows(table)) found.push_back(row.at("id"));
  return found;
}

int StoreTest::rowCount(const std::string& table) {
  return static_cast<int>(rows(table).size());
}

std::vector<Row> StoreTest::everythingBut(const std::string& exceptTable,
                                          const std::string& exceptId) {
  std::string select =
      "SELECT name, sql FROM sqlite_master ORDER BY name; SELECT * FROM oauth_meta;";
  for (const char* table :
       {names::kClientInfoTable, names::kGrantCodeTable, names::kTokenTable, names::kLogTable}) {
    select += std::string("SELECT '") + table + "', * FROM " + table;
    if (table == exceptTable && !exceptId.empty()) select += " WHERE id <> " + exceptId;
    select += " ORDER BY id;";
  }
  return sql(select);
}

std::vector<Row> StoreTest::everything() {
  return everythingBut("", "");
}
