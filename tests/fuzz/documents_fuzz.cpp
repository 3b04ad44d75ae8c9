// Request documents of any shape, into the clause builders and through the four
// generic operations. The input: one byte for the operation, one for the table,
// then the document as JSON; text that is no JSON is taken as a value.

#include <json/reader.h>
#include <json/value.h>

#include <algorithm>
#include <array>
#include <memory>
#include <string>
#include <vector>

#include "core/oauth_db_basic.h"
#include "tests/fuzz/world.h"
#include "utils/oauth_names.h"

namespace {

namespace names = KELDOAUTHSERVER::names;
using fuzz::Database;
using fuzz::expect;
using fuzz::World;
using KELDOAUTHSERVER::OAUTHDBBasic;

constexpr int kCodeBefore = 42;

/// A store that can be given any table.
class AnyStore : public OAUTHDBBasic {};

// What a document means -----------------------------------------------------------

bool isText(const Json::Value& value) {
  return !value.isObject() && !value.isArray();
}

bool isPairs(const Json::Value& value) {
  if (value.isNull()) return true;
  return value.isObject() && std::all_of(value.begin(), value.end(), isText);
}

/// A member, null when it is absent.
const Json::Value& at(const Json::Value& request, const char* key) {
  return request[key];
}

/// Pairs as SQL with a question mark for every value.
struct Bound {
  std::string columns;
  std::vector<std::string> texts;
};

Bound bindPairs(const Json::Value& pairs, const char* separator) {
  Bound bound;
  for (const std::string& column : pairs.getMemberNames()) {
    if (!bound.columns.empty()) bound.columns += separator;
    bound.columns += column + "=?";
    bound.texts.push_back(pairs[column].asString());
  }
  return bound;
}

Bound bindCondition(const Json::Value& condition) {
  if (condition.empty()) return {};
  Bound bound = bindPairs(condition, " and ");
  bound.columns.insert(0, " WHERE ");
  return bound;
}

struct Statement {
  std::string sql;
  std::vector<std::string> texts;
  bool isReached = true;  // false: SQLite sees a text that ends in a literal

  void append(const Bound& bound) {
    sql += bound.columns;
    for (const std::string& text : bound.texts) append(text);
  }
  void append(const std::string& text) {
    if (text.find('\0') != std::string::npos) isReached = false;
    texts.push_back(text);
  }
};

Statement insertStatement(const std::string& table, const Json::Value& row) {
  Statement statement;
  std::string columns;
  std::string values;
  for (const std::string& column : row.getMemberNames()) {
    columns += (columns.empty() ? "" : ", ") + column;
    values += values.empty() ? "" : ", ";
    if (!row[column].isNull()) {
      values += '?';
      statement.append(row[column].asString());
    } else {
      values += column == names::kTimestamp ? "strftime('%s','now')" : "NULL";
    }
  }
  statement.sql = "INSERT INTO " + table + " (" + columns + ") VALUES (" + values + ")";
  return statement;
}

Statement selectStatement(const std::string& table, const Json::Value& request) {
  Statement statement{"SELECT * FROM " + table, {}};
  if (request.isMember(names::kConditionLike)) {
    statement.sql += " WHERE " + request[names::kConditionLike].asString();
  } else {
    statement.append(bindCondition(at(request, names::kCondition)));
  }
  statement.sql += ' ' + at(request, names::kOption).asString();
  return statement;
}

Statement updateStatement(const std::string& table, const Json::Value& request) {
  Statement statement{"UPDATE " + table + " SET ", {}};
  statement.append(bindPairs(at(request, names::kModified), ", "));
  statement.append(bindCondition(at(request, names::kCondition)));
  return statement;
}

Statement deleteStatement(const std::string& table, const Json::Value& request) {
  Statement statement{"DELETE FROM " + table, {}};
  statement.append(bindCondition(at(request, names::kCondition)));
  return statement;
}

/// False when the cipher refuses a value.
bool encryptIn(Json::Value& pairs) {
  if (!pairs.isObject()) return true;
  for (const char* secret : {names::kClientId, names::kClientSecret}) {
    if (!pairs.isMember(secret)) continue;
    const auto cipher = fuzz::encrypted(pairs[secret].asString());
    if (!cipher) return false;
    pairs[secret] = *cipher;
  }
  return true;
}

// What only the stores' own code decides ------------------------------------------
//
// Names of columns and the two raw texts go into the statement as they stand, so
// that no outside input ever gets there: they are taken from these lists.

constexpr std::array kColumns{
    names::kAccessToken, names::kClientId,     names::kClientSecret, names::kCode,
    names::kDisplayName, names::kEnable,       names::kExpiredTime,  names::kFlowType,
    names::kId,          names::kIp,           names::kMsg,          names::kRedirectUri,
    names::kScope,       names::kState,        names::kTimestamp,    names::kUsername,
    names::kCondition,   names::kRefreshToken,
};

constexpr std::array kPredicates{"", "msg like '%it''s%'", "id > 1", "no predicate (", "1"};
constexpr std::array kTails{"", "ORDER BY id DESC", "LIMIT 1", "no tail"};

template <typename List>
std::string pick(const List& list, const std::string& text) {
  if (std::find(list.begin(), list.end(), text) != list.end()) return text;
  unsigned sum = 0;
  for (const char c : text) sum = sum * 31 + static_cast<unsigned char>(c);
  return list[sum % list.size()];
}

void nameColumns(Json::Value& pairs) {
  if (!pairs.isObject()) return;
  Json::Value named(Json::objectValue);
  for (const std::string& name : pairs.getMemberNames()) named[pick(kColumns, name)] = pairs[name];
  pairs = named;
}

void nameEverything(Json::Value& request) {
  if (!request.isObject()) return;
  for (const char* key : {names::kCondition, names::kModified}) {
    if (request.isMember(key)) nameColumns(request[key]);
  }
  if (at(request, names::kConditionLike).isString()) {
    Json::Value& like = request[names::kConditionLike];
    like = pick(kPredicates, like.asString());
  }
  if (at(request, names::kOption).isString()) {
    Json::Value& option = request[names::kOption];
    option = pick(kTails, option.asString());
  }
}

// The operations ------------------------------------------------------------------

struct Case {
  AnyStore& store;
  std::string table;
  Json::Value document;
};

void expectError(const OAUTHDBBasic& store, int code, const char* message, const char* what) {
  expect(store.GetErrCode() == code && store.GetErrMsg() == message, what,
         std::to_string(store.GetErrCode()) + ' ' + store.GetErrMsg());
}

/// Refused before anything else happens.
void expectBadParameters(const Case& test, bool success) {
  expect(!success, "a document of a foreign shape is accepted");
  expectError(test.store, -2, "Bad parameters", "foreign shape");
}

void expectCipherFailure(const Case& test, bool success, const char* message) {
  expect(!success, "a value that cannot be encrypted is accepted");
  expectError(test.store, -4, message, "encryption");
}

/// The statement that the operation means ran, and with the same success.
Database::Effect expectSame(const Case& test, bool success, const Statement& statement,
                            bool needsChange) {
  Database::Effect model;
  if (statement.isReached) model = World::instance().model().run(statement.sql, statement.texts);
  const bool wanted = model.ok && (!needsChange || model.changes > 0);
  expect(success == wanted, "success", statement.sql);
  if (model.ok) {
    expectError(test.store, kCodeBefore, "before", "no error");
  } else {
    expect(test.store.GetErrCode() > 0 && test.store.GetErrCode() != kCodeBefore, "SQLite's code");
  }
  return model;
}

void checkAdd(Case& test) {
  nameColumns(test.document);
  Json::Value row = test.document;
  const bool success = test.store.DBAdd(test.document);
  if (!isPairs(row)) return expectBadParameters(test, success);
  if (!encryptIn(row)) return expectCipherFailure(test, success, "Data Encrypt failed");
  expectSame(test, success, insertStatement(test.table, row), false);
  expect(test.document == row, "the caller's row holds the ciphertext");
}

void checkGet(Case& test) {
  nameEverything(test.document);
  Json::Value request = test.document;
  Json::Value result = "untouched";
  const bool success = test.store.DBGet(test.document, &result);
  const bool fits =
      (request.isNull() || request.isObject()) && isPairs(at(request, names::kCondition)) &&
      isText(at(request, names::kConditionLike)) && isText(at(request, names::kOption));
  if (!fits) {
    expect(result == "untouched", "the result of a refused request");
    return expectBadParameters(test, success);
  }
  if (!encryptIn(request[names::kCondition])) {
    expect(result == "untouched", "the result of a request without cipher");
    return expectCipherFailure(test, success, "Data Decrypt failed");
  }
  const auto model = expectSame(test, success, selectStatement(test.table, request), false);
  expect(result == fuzz::asResult(model.rows), "the rows", result.toStyledString());
}

void checkEdit(Case& test) {
  nameEverything(test.document);
  Json::Value request = test.document;
  const bool success = test.store.DBEdit(test.document);
  if (!(request.isNull() || request.isObject()) || !isPairs(at(request, names::kCondition)) ||
      !isPairs(at(request, names::kModified))) {
    return expectBadParameters(test, success);
  }
  if (!encryptIn(request[names::kCondition]) || !encryptIn(request[names::kModified])) {
    return expectCipherFailure(test, success, "Data Encrypt failed");
  }
  expectSame(test, success, updateStatement(test.table, request), true);
}

void checkDel(Case& test) {
  nameEverything(test.document);
  Json::Value request = test.document;
  const bool success = test.store.DBDel(test.document);
  if (!(request.isNull() || request.isObject()) || !isPairs(at(request, names::kCondition))) {
    return expectBadParameters(test, success);
  }
  if (!encryptIn(request[names::kCondition])) {
    return expectCipherFailure(test, success, "Data Encrypt failed");
  }
  expectSame(test, success, deleteStatement(test.table, request), true);
}

// The clause builders -------------------------------------------------------------

std::string literal(const Json::Value& value) {
  return '\'' + fuzz::doubled(value.asString()) + '\'';
}

std::string joined(const Json::Value& pairs, const std::string& separator) {
  std::string text;
  for (const std::string& name : pairs.getMemberNames()) {
    text += (text.empty() ? "" : separator) + name + '=' + literal(pairs[name]);
  }
  return text;
}

std::string where(const Json::Value& condition) {
  return condition.empty() ? "" : " WHERE " + joined(condition, " and ");
}

std::string inserted(const Json::Value& row) {
  std::string columns;
  std::string values;
  for (const std::string& name : row.getMemberNames()) {
    if (!columns.empty()) {
      columns += ", ";
      values += ", ";
    }
    columns += name;
    const char* null = name == "timestamp" ? "strftime('%s','now')" : "NULL";
    values += row[name].isNull() ? null : literal(row[name]);
  }
  return " (" + columns + ") VALUES(" + values + ")";
}

/// No statement runs with this text.
void expectRefused(Case& test, const std::string& text) {
  for (const std::string head : {"DELETE FROM ", "UPDATE ", "INSERT INTO ", "SELECT * FROM "}) {
    for (const char* verb : {"", " WHERE ", " SET "}) {
      const std::string statement = head + test.table + verb + text + ";";
      expect(test.store.DBCmd(statement, nullptr, nullptr) == 0, "a foreign clause", statement);
    }
  }
}

/// Of a document that no store builds. An empty array is an empty condition.
void checkForeignClauses(Case& test) {
  const auto isEmptyArray = [](const Json::Value& value) {
    return value.isArray() && value.empty();
  };
  Json::Value pairs = test.document;
  nameColumns(pairs);
  if (!isPairs(pairs)) expectRefused(test, test.store.GetInsertParam(pairs));
  if (!isPairs(pairs) && !isEmptyArray(pairs)) {
    expectRefused(test, test.store.ConcateParam(pairs, ", "));
    expectRefused(test, test.store.GetConditionParam(pairs));
  }

  Json::Value request = test.document;
  nameEverything(request);
  const std::string update = test.store.GetUpdateParam(request);
  if (!request.isNull() && !request.isObject()) return expectRefused(test, update);
  const Json::Value& condition = at(request, names::kCondition);
  const bool isForeign = !isPairs(at(request, names::kModified)) || !isPairs(condition);
  if (isForeign && !isEmptyArray(condition)) expectRefused(test, update);
}

/// Whatever the shape, a text comes out; of the stores' own shapes, this one.
void checkClauses(Case& test) {
  checkForeignClauses(test);
  const Json::Value document = test.document;
  const std::string row = test.store.GetInsertParam(document);
  const std::string list = test.store.ConcateParam(document, ", ");
  const std::string condition = test.store.GetConditionParam(document);
  if (isPairs(document)) {
    expect(row == inserted(document), "the clause of a row", row);
    expect(list == joined(document, ", "), "the list of pairs", list);
    expect(condition == where(document), "the clause of a condition", condition);
  }
  const std::string update = test.store.GetUpdateParam(document);
  if (!document.isNull() && !document.isObject()) return;
  const Json::Value& modified = at(document, names::kModified);
  if (!isPairs(modified) || !isPairs(at(document, names::kCondition))) return;
  expect(update == " SET " + joined(modified, ", ") + where(at(document, names::kCondition)),
         "the clause of an update", update);
}

/// What the bytes stand for.
Json::Value parse(std::string_view text) {
  static const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
  Json::Value document;
  try {
    if (reader->parse(text.data(), text.data() + text.size(), &document, nullptr)) return document;
  } catch (const Json::Exception&) {
    // nested too deep for the parser
  }
  Json::Value plain;
  plain[names::kCondition][names::kId] = "1";
  plain[names::kModified][names::kScope] = std::string(text);
  plain[names::kScope] = std::string(text);
  return plain;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  constexpr std::array kTables{names::kClientInfoTable, names::kGrantCodeTable, names::kTokenTable,
                               names::kLogTable};
  constexpr std::array kOperations{checkAdd, checkGet, checkEdit, checkDel, checkClauses};
  constexpr std::array kNames{"DBAdd", "DBGet", "DBEdit", "DBDel", "clauses"};

  World& world = World::instance();
  world.startOver();
  static AnyStore store;

  fuzz::Input input(data, size);
  const unsigned operation = input.choice(kOperations.size());
  Case test{store, kTables[input.choice(kTables.size())], parse(input.rest())};
  store.SetTabName(test.table);
  store.SetErrCode(kCodeBefore);
  store.SetErrMsg("before");
  kOperations[operation](test);
  world.expectAgreement(kNames[operation]);
  return 0;
}
