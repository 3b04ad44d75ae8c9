#include "grants/rows/store.h"

#include <algorithm>
#include <initializer_list>
#include <limits>
#include <utility>

#include "core/oauth_errors.h"
#include "grants/rows/quotes.h"
#include "utils/decimal.h"
#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER::grants {
namespace {

constexpr char kNotReady[] = "DB is not ready!!";
constexpr int kMissed = 1;  // SQLite's code for what has no code of its own
constexpr char kMissedRow[] = "a row is not as it was read a moment ago";
constexpr long long kLongest = 100LL * 365 * 24 * 60 * 60;

Policy sane(Policy policy) {
  for (long long* seconds : {&policy.idle, &policy.family, &policy.grace, &policy.pushed,
                             &policy.pushedOpen, &policy.auditPause}) {
    *seconds = std::clamp(*seconds, 0LL, kLongest);
  }
  return policy;
}

/// What SQLite would say of a random failure that left no code.
Trouble troubleOf(const OAUTHDBBasic& table) {
  const int code = table.GetErrCode();
  return {code, code == errors::kNone.code ? kNotReady : table.GetErrMsg()};
}

void clearError(OAUTHDBBasic& table) {
  table.SetErrCode(errors::kNone.code);
  table.SetErrMsg("");
}

/// Of an operation that also fails, without a code, when it finds no row.
bool foundRow(OAUTHDBBasic& table, bool done) {
  if (!done && table.GetErrCode() != errors::kNone.code) throw troubleOf(table);
  return done;
}

int appendNumbers(void* arg, int count, char** values, char** /*columns*/) {
  auto& numbers = *static_cast<Json::Value*>(arg);
  for (int i = 0; i < count; ++i) numbers.append(values[i] == nullptr ? "" : values[i]);
  return 0;
}

Json::Value select(OAUTHDBBasic& table, Json::Value request) {
  clearError(table);
  Json::Value rows(Json::arrayValue);
  if (!table.DBGet(request, &rows)) throw troubleOf(table);
  return rows;
}

}  // namespace

Store::Store(const Policy& given)
    : policy(sane(given)),
      applications(names::kClientInfoTable),
      codes(names::kGrantCodeTable, applications),
      tokens(names::kTokenTable, applications),
      log(names::kLogTable, applications) {
  requireReady();
}

/// A step of the start-up may fail and still leave every table there.
void Store::requireReady() {
  Trouble trouble = troubleOf(applications);
  for (OAUTHDBBasic* table : std::initializer_list<OAUTHDBBasic*>{
           &applications, &codes, &tokens, static_cast<OAUTHDBBasic*>(&log)}) {
    if (table->DBCmd("", nullptr, nullptr) == 0) throw std::move(trouble);
  }
}

// Reading -----------------------------------------------------------------------

Json::Value Store::rowsBy(OAUTHDBBasic& table, const Json::Value& condition) {
  Json::Value request;
  request[names::kCondition] = condition;
  return select(table, std::move(request));
}

Json::Value Store::rowsWhere(OAUTHDBBasic& table, const std::string& condition,
                             const std::string& tail) {
  Json::Value request(Json::objectValue);
  if (!condition.empty()) request[names::kConditionLike] = condition;
  if (!tail.empty()) request[names::kOption] = tail;
  return select(table, std::move(request));
}

Json::Value Store::rowsOf(const std::string& select) {
  clearError(applications);
  Json::Value rows(Json::arrayValue);
  if (applications.DBCmd(select, OAUTHDBBasic::TabGetCallback, &rows) == 0) {
    throw troubleOf(applications);
  }
  return rows;
}

std::vector<long long> Store::numbers(const std::string& select) {
  clearError(applications);
  Json::Value columns(Json::arrayValue);
  if (applications.DBCmd(select, appendNumbers, &columns) == 0) throw troubleOf(applications);
  std::vector<long long> numbers;
  for (const Json::Value& column : columns) numbers.push_back(decimalValue(column));
  return numbers;
}

// Changing ----------------------------------------------------------------------

void Store::insert(OAUTHDBBasic& table, Json::Value row) {
  clearError(table);
  if (!table.DBAdd(row)) throw troubleOf(table);
}

bool Store::change(OAUTHDBBasic& table, const Json::Value& condition, const Json::Value& modified) {
  Json::Value request;
  request[names::kCondition] = condition;
  request[names::kModified] = modified;
  clearError(table);
  return foundRow(table, table.DBEdit(request));
}

void Store::changeSeen(OAUTHDBBasic& table, const Json::Value& condition,
                       const Json::Value& modified) {
  if (!change(table, condition, modified)) failMissed();
}

void Store::failMissed() {
  throw Trouble(kMissed, kMissedRow);
}

bool Store::erase(OAUTHDBBasic& table, const Json::Value& condition) {
  Json::Value request;
  request[names::kCondition] = condition;
  clearError(table);
  return foundRow(table, table.DBDel(request));
}

void Store::eraseWhere(const char* table, const std::string& condition) {
  const std::string statement = std::string("DELETE FROM ") + table + " WHERE " + condition;
  clearError(applications);
  if (applications.DBCmd(statement, nullptr, nullptr) == 0) throw troubleOf(applications);
}

long long Store::countErased(const char* table, const std::string& condition) {
  eraseWhere(table, condition);
  return numbers("SELECT changes()").front();
}

std::string Store::sealed(const std::string& identifier) {
  Json::Value row;
  row[names::kClientId] = rows::doubled(identifier);
  if (OAUTHDBBasic::ParamEncrypt(row) == 0) {
    throw Trouble(errors::kEncryptFailed.code, errors::kEncryptFailed.message);
  }
  return row[names::kClientId].asString();
}

// Several steps as one ------------------------------------------------------------

/// A rollback that found no memory has left its transaction open: its time is
/// now.
Whole::Whole(Store& store) : store_(store) {
  if (begin()) return;
  Trouble trouble = troubleOf(store_.applications);
  const bool isWithinAnother = trouble.kind() == Trouble::Kind::kOther;
  if (!isWithinAnother || store_.applications.DBCmd("ROLLBACK", nullptr, nullptr) == 0 ||
      !begin()) {
    throw std::move(trouble);
  }
}

bool Whole::begin() {
  clearError(store_.applications);
  return transaction_.emplace(store_.applications).Begin();
}

/// A transaction that SQLite gave up on its own leaves its reason with the store
/// whose statement failed, which need not have failed the operation: the log's
/// rotation.
void Whole::commit() {
  clearError(store_.applications);
  if (transaction_->Commit()) return;
  throw troubleOf(store_.applications.GetErrCode() != errors::kNone.code
                      ? static_cast<OAUTHDBBasic&>(store_.applications)
                      : store_.log);
}

// Values ------------------------------------------------------------------------

long long later(long long time, long long seconds) {
  const long long last = std::numeric_limits<long long>::max() - seconds;
  return std::min(time, last) + seconds;
}

bool isWithinGrace(long long time, long long now, const Policy& policy) {
  return time <= now && time > now - policy.grace;
}

}  // namespace KELDOAUTHSERVER::grants
