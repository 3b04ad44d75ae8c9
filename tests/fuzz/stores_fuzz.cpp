// Every text of every store operation. The input: one byte for the operation,
// one for a row id, one for whether identifiers are brought to 64 bytes, then
// the texts.

#include <boost/asio/ip/address.hpp>

#include <array>
#include <string>
#include <vector>

#include "tests/fuzz/store_operations.h"
#include "tests/fuzz/world.h"
#include "utils/oauth_names.h"

namespace {

using namespace KELDOAUTHSERVER;
using fuzz::Argument;
using fuzz::Change;
using fuzz::Database;
using fuzz::expect;
using fuzz::LookUp;
using fuzz::Stored;
using fuzz::Stores;
using fuzz::Texts;
using fuzz::World;

constexpr int kCodeBefore = 42;
constexpr char kMessageBefore[] = "before";
constexpr char kFreshExpiry[] = "1700000600";  // 600 seconds after the fixed clock

// The model -------------------------------------------------------------------------

bool isClientColumn(const std::string& column) {
  return column == names::kClientId || column == names::kClientSecret;
}

std::string withoutScheme(const std::string& address) {
  for (const std::string scheme : {"https://", "http://"}) {
    if (address.rfind(scheme, 0) == 0) return address.substr(scheme.size());
  }
  return address;
}

bool isAddress(const std::string& text) {
  boost::system::error_code error;
  boost::asio::ip::make_address(text, error);
  return !error;
}

/// Columns and what is stored in them. `isWhole` is false where a NUL byte cuts
/// the statement, which SQLite then refuses.
struct StoredRow {
  std::vector<std::string> columns;
  Texts texts;
  bool isWhole = true;

  void add(const std::string& column, std::string text) {
    if (isClientColumn(column)) text = fuzz::encrypted(text).value();
    if (text.find('\0') != std::string::npos) isWhole = false;
    columns.push_back(column);
    texts.push_back(text);
  }
  void add(const Argument& argument, const std::string& text) {
    add(argument.column,
        argument.stored == Stored::kAsGiven ? text : fuzz::doubled(fuzz::upToNul(text)));
  }
};

bool fits(const Change& change, const Texts& texts) {
  for (std::size_t i = 0; i < texts.size(); ++i) {
    const Argument& argument = change.arguments[i];
    if (texts[i].size() < argument.min || texts[i].size() > argument.max) return false;
    if (argument.column == names::kEnable && texts[i] != "0" && texts[i] != "1") return false;
  }
  return true;
}

bool hasBadAddress(const Change& change, const Texts& texts) {
  for (std::size_t i = 0; i < texts.size(); ++i) {
    if (change.arguments[i].column != names::kIp) continue;
    return !texts[i].empty() && !isAddress(texts[i]);
  }
  return false;
}

StoredRow storedRow(const Change& change, const Texts& texts) {
  StoredRow row;
  for (std::size_t i = 0; i < texts.size(); ++i) row.add(change.arguments[i], texts[i]);
  return row;
}

std::string joined(const std::vector<std::string>& texts, const char* after,
                   const char* separator) {
  std::string line;
  for (const std::string& text : texts) line += (line.empty() ? "" : separator) + text + after;
  return line;
}

Database::Effect insertInModel(const Change& change, const StoredRow& row) {
  if (!row.isWhole) return {};
  std::string marks = "?";
  for (std::size_t i = 1; i < row.columns.size(); ++i) marks += ", ?";
  return World::instance().model().run("INSERT INTO " + change.table + " (" +
                                           joined(row.columns, "", ", ") + ") VALUES (" + marks +
                                           ")",
                                       row.texts);
}

void writeLogInModel(const std::string& msg) {
  World::instance().model().run("INSERT INTO oauth_log (msg, timestamp) VALUES (?, ?)",
                                {fuzz::doubled(fuzz::upToNul(msg)), std::to_string(fuzz::kNow)});
}

// The checks ------------------------------------------------------------------------

void expectError(const OAUTHDBBasic& store, int code, const std::string& message,
                 const char* what) {
  expect(store.GetErrCode() == code && store.GetErrMsg() == message, what,
         std::to_string(store.GetErrCode()) + ' ' + store.GetErrMsg());
}

void expectUnchanged(const OAUTHDBBasic& store, const char* what) {
  expectError(store, kCodeBefore, kMessageBefore, what);
}

void expectRefused(const OAUTHDBBasic& store, int code, const char* what) {
  if (code == fuzz::kNoCode) return expectUnchanged(store, what);
  expectError(store, code, "Bad parameters", what);
}

OAUTHDBBasic& storeOf(Stores& stores, const std::string& table) {
  if (table == names::kClientInfoTable) return stores.clients;
  if (table == names::kGrantCodeTable) return stores.codes;
  if (table == names::kTokenTable) return stores.tokens;
  return stores.log;
}

void checkInsertion(Stores& stores, const Change& change, Texts texts) {
  Json::Value out(Json::objectValue);
  const bool success = change.run(stores, 0, texts, out);
  const OAUTHDBBasic& store = storeOf(stores, change.table);
  const bool isClient = change.table == names::kClientInfoTable;

  for (std::size_t i = 0; i < texts.size(); ++i) {
    const bool isRegistered = isClient && change.arguments[i].column == names::kRedirectUri;
    if (isRegistered) texts[i] = withoutScheme(texts[i]);
  }
  if (hasBadAddress(change, texts)) {
    expect(!success && out.empty(), "an insertion with a bad address", change.name);
    return expectUnchanged(store, change.name);
  }
  if (!fits(change, texts)) {
    expect(!success && out.empty(), "an insertion with a bad length", change.name);
    return expectRefused(store, change.refusalCode, change.name);
  }
  StoredRow row = storedRow(change, texts);
  for (const std::string& column : change.generated) {
    expect(out[column].asString().size() == 64, "what was drawn", change.name);
    row.add(column, out[column].asString());
  }
  if (isClient && change.arguments.back().column != names::kEnable) row.add(names::kEnable, "1");
  const bool isIssued = !change.generated.empty() && !isClient;
  if (isIssued) row.add(names::kExpiredTime, kFreshExpiry);
  if (change.table == names::kLogTable) row.add(names::kTimestamp, std::to_string(fuzz::kNow));

  const bool wanted = insertInModel(change, row).ok;
  expect(success == wanted, "the success of an insertion", change.name);
  if (!wanted) return expect(store.GetErrCode() > 0, "SQLite's code", change.name);
  if (isClient) {
    const std::size_t displayName = change.arguments.size() - (change.generated.empty() ? 2 : 1);
    writeLogInModel("Application registed[" + texts[displayName] + "]");
  }
  expectUnchanged(store, change.name);
}

void checkEdit(Stores& stores, const Change& change, long long id, const Texts& texts) {
  Json::Value out;
  const bool success = change.run(stores, id, texts, out);
  const OAUTHDBBasic& store = storeOf(stores, change.table);
  if (!fits(change, texts)) {
    expect(!success, "an edit with a bad length", change.name);
    return expectRefused(store, change.refusalCode, change.name);
  }
  StoredRow row = storedRow(change, texts);
  Database::Effect model;
  if (row.isWhole) {
    const std::string set = joined(row.columns, "=?", ", ");
    row.texts.push_back(std::to_string(id));
    model = World::instance().model().run("UPDATE " + change.table + " SET " + set + " WHERE id=?",
                                          row.texts);
  }
  expect(success == (model.ok && model.changes > 0), "the success of an edit", change.name);
  if (model.ok) {
    expectUnchanged(store, change.name);
  } else {
    expect(store.GetErrCode() > 0 && store.GetErrCode() != kCodeBefore, "SQLite's code",
           change.name);
  }
}

void checkLookUp(Stores& stores, const LookUp& lookUp, const std::string& text) {
  Json::Value rows = "untouched";
  const bool success = lookUp.rows(stores, text, &rows);
  const OAUTHDBBasic& store = storeOf(stores, lookUp.table);
  const int index = lookUp.index != nullptr ? lookUp.index(stores, text) : 0;
  if (text.size() != lookUp.argument.min) {
    expect(!success && rows == "untouched" && index == 0, "a look-up with a bad length",
           lookUp.name);
    return expectRefused(store, -2, lookUp.name);
  }
  StoredRow row;
  row.add(lookUp.argument, text);
  Database::Effect model;
  if (row.isWhole) {
    model = World::instance().model().run(
        "SELECT * FROM " + lookUp.table + " WHERE " + row.columns[0] + "=?", row.texts);
  }
  expect(success == model.ok, "the success of a look-up", lookUp.name);
  if (!model.ok) return;
  expect(rows == fuzz::asResult(model.rows), "the rows of a look-up", rows.toStyledString());
  if (lookUp.index == nullptr) return;
  expect(index == (model.rows.empty() ? 0 : std::stoi(model.rows[0].at(names::kId))), "the index");
}

void checkVerification(Stores& stores, const std::string& token) {
  Json::Value result(Json::objectValue);
  const bool success = stores.tokens.Verify(token, result);
  Json::Value wanted(Json::objectValue);
  if (token.size() != 64) {
    wanted[names::kErrCode] = -2;
    wanted[names::kErrMsg] = "Bad parameters";
  } else if (token == std::string(64, 'a')) {  // the one that has not expired
    wanted[names::kUsername] = "alice";
    wanted[names::kScope] = "read";
    wanted[names::kState] = "s";
  } else {
    wanted[names::kErrCode] = -3;
    wanted[names::kErrMsg] = "Access Token Expired";
  }
  expect(success == wanted.isMember(names::kUsername), "the verification", token);
  expect(result == wanted, "what the verification says", result.toStyledString());
}

void checkListing(Stores& stores, const std::string& filter, unsigned tail) {
  constexpr std::array kTails{"", "ORDER BY id DESC", "LIMIT 1"};
  const char* option = kTails[tail % kTails.size()];
  Json::Value rows;
  expect(stores.log.Get(filter, option, &rows) != 0, "a listing of the log", filter);

  std::string sql = "SELECT * FROM oauth_log";
  Texts texts;
  if (!filter.empty()) {
    sql += " WHERE msg LIKE ?";
    texts.push_back('%' + fuzz::upToNul(filter) + '%');
  }
  const auto model = World::instance().model().run(sql + ' ' + option, texts);
  expect(rows == fuzz::asResult(model.rows), "the rows of a listing", rows.toStyledString());
}

// Dispatch --------------------------------------------------------------------------

/// An identifier seldom has its 64 bytes by chance. Filled up with this letter,
/// a short one is that of a row.
std::string identifier(std::string text) {
  text.resize(64, 'a');
  return text;
}

Texts textsFor(const Change& change, fuzz::Input& input, bool fillsUp) {
  Texts texts;
  for (const Argument& argument : change.arguments) {
    texts.push_back(input.text());
    if (fillsUp && argument.min == 64) texts.back() = identifier(texts.back());
  }
  return texts;
}

void run(Stores& stores, fuzz::Input& input) {
  const auto& added = fuzz::insertions();
  const auto& edited = fuzz::edits();
  const auto& looked = fuzz::lookUps();
  const std::size_t all = added.size() + edited.size() + looked.size() + 2;

  std::size_t choice = input.choice(static_cast<unsigned>(all));
  const long long id = input.choice(4);
  const bool fillsUp = input.choice(2) == 0;
  if (choice < added.size()) {
    return checkInsertion(stores, added[choice], textsFor(added[choice], input, fillsUp));
  }
  choice -= added.size();
  if (choice < edited.size()) {
    return checkEdit(stores, edited[choice], id, textsFor(edited[choice], input, fillsUp));
  }
  choice -= edited.size();
  const std::string text = fillsUp ? identifier(input.text()) : input.text();
  if (choice < looked.size()) return checkLookUp(stores, looked[choice], text);
  if (choice == looked.size()) return checkVerification(stores, text);
  checkListing(stores, text, static_cast<unsigned>(id));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  World& world = World::instance();
  world.startOver();
  static Stores stores;
  for (OAUTHDBBasic* store :
       {static_cast<OAUTHDBBasic*>(&stores.clients), static_cast<OAUTHDBBasic*>(&stores.codes),
        static_cast<OAUTHDBBasic*>(&stores.tokens), static_cast<OAUTHDBBasic*>(&stores.log)}) {
    store->SetErrCode(kCodeBefore);
    store->SetErrMsg(kMessageBefore);
  }
  fuzz::Input input(data, size);
  run(stores, input);
  world.expectAgreement("a store operation");
  return 0;
}
