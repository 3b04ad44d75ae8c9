#include "stores/oauth_grantCode.h"

#include <syslog.h>

#include <system_error>

#include "core/oauth_errors.h"
#include "stores/store_support.h"
#include "utils/clock.h"
#include "utils/diagnostics.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"
#include "utils/sql_text.h"
#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {
namespace {

constexpr char kSource[] = "oauth_grantCode";

/// The numbers that this source's lines carry.
enum Line : int {
  kAddLine = 47,
  kAddFullLine = 56,
  kAddBadAddressLine = 61,
  kAddBadLine = 71,
  kEditBadLine = 103,
  kEditWithExpiryLine = 126,
  kEditWithExpiryBadLine = 134,
  kRevokeLine = 151,
  kDelLine = 166,
  kGetIndexLine = 176,
  kGetByCodeLine = 188,
  kGetByCodeBadLine = 194,
  kGetByIdLine = 206,
  kGetAllLine = 216,
  kPurgeLine = 225,

  // "Unexpected failure"
  kAddThrew = 901,
  kAddGeneratedThrew = 902,
  kEditThrew = 903,
  kEditWithExpiryThrew = 904,
  kRevokeThrew = 905,
  kDelThrew = 906,
  kPurgeThrew = 907,
  kGetByCodeThrew = 908,
  kGetIndexThrew = 909,
  kGetByIdThrew = 910,
  kGetAllThrew = 911,
};

/// Issuing and editing leave the object's error as it was.
int refuse(Line line) {
  syslog(LOG_ERR, "%s:%d Bad parameters", kSource, line);
  return 0;
}

}  // namespace

OAUTHDBGrantCode::OAUTHDBGrantCode(const std::string& tableName) {
  SetTabName(tableName);
}

OAUTHDBGrantCode::OAUTHDBGrantCode(const std::string& tableName, OAUTHDBBasic& store)
    : OAUTHDBBasic(tableName, store) {}

// Issuing ---------------------------------------------------------------------

int OAUTHDBGrantCode::Add(const std::string& username, const std::string& client_id,
                          const std::string& scope, const std::string& code,
                          const std::string& expired_time, const std::string& state,
                          const std::string& ip, Json::Value& out) try {
  traceEntry(kStoreTrace, kSource, kAddLine, "Add");
  const int badAddress = addressError(ip);

  if (DBCheckRowMax(static_cast<unsigned long>(getTableRowMax(names::kGrantCodeMax))) == 0) {
    syslog(LOG_ERR, "%s:%d GrantCode Table is full", kSource, kAddFullLine);
    return Fail(errors::kGrantCodeFull);
  }
  if (!ip.empty() && badAddress != 0) {
    syslog(LOG_ERR, "%s:%d Bad IP address[%s]", kSource, kAddBadAddressLine,
           std::generic_category().message(badAddress).c_str());
    return 0;
  }
  if (!fits(username, bounds::kUsername) || !fits(client_id, bounds::kIdentifier) ||
      !fits(scope, bounds::kScope) || !fits(code, bounds::kIdentifier) ||
      !fits(expired_time, bounds::kExpiredTime) || !fits(state, bounds::kState)) {
    return refuse(kAddBadLine);
  }

  Json::Value row;
  row[names::kUsername] = quoteSql(username);
  row[names::kClientId] = quoteSql(client_id);
  row[names::kScope] = quoteSql(scope);
  row[names::kCode] = quoteSql(code);
  row[names::kState] = quoteSql(state);
  row[names::kExpiredTime] = expired_time;
  row[names::kId] = Json::Value();
  row[names::kIp] = ip;

  out[names::kCode] = code;
  return DBAdd(row);
} catch (...) {
  return FailUnexpectedly(kSource, kAddThrew);
}

int OAUTHDBGrantCode::Add(const std::string& username, const std::string& client_id,
                          const std::string& scope, const std::string& state, const std::string& ip,
                          Json::Value& out) try {
  const long long expiry = currentTime() + getExpiredPeriod(names::kGrantCodeExpired);
  const std::string code = getRandomStr(kIdentifierLength);
  return Add(username, client_id, scope, code, std::to_string(expiry), state, ip, out);
} catch (...) {
  return FailUnexpectedly(kSource, kAddGeneratedThrew);
}

// Changes ---------------------------------------------------------------------

int OAUTHDBGrantCode::Edit(long long id, const std::string& username, const std::string& client_id,
                           const std::string& scope, const std::string& state) try {
  if (!fits(username, bounds::kUsername) || !fits(client_id, bounds::kIdentifier) ||
      !fits(scope, bounds::kScope) || !fits(state, bounds::kState)) {
    return refuse(kEditBadLine);
  }
  Json::Value request = requestById(id);
  Json::Value& modified = request[names::kModified];
  modified[names::kUsername] = username;
  modified[names::kClientId] = client_id;
  modified[names::kScope] = scope;
  modified[names::kState] = state;
  return DBEdit(request);
} catch (...) {
  return FailUnexpectedly(kSource, kEditThrew);
}

int OAUTHDBGrantCode::Edit(long long id, const std::string& username, const std::string& client_id,
                           const std::string& scope, const std::string& expired_time,
                           const std::string& state) try {
  traceEntry(kStoreTrace, kSource, kEditWithExpiryLine, "Edit");
  if (!fits(username, bounds::kUsername) || !fits(client_id, bounds::kIdentifier) ||
      !fits(scope, bounds::kScope) || !fits(expired_time, bounds::kExpiredTime) ||
      !fits(state, bounds::kState)) {
    return refuse(kEditWithExpiryBadLine);
  }
  Json::Value request = requestById(id);
  Json::Value& modified = request[names::kModified];
  modified[names::kUsername] = quoteSql(username);
  modified[names::kClientId] = quoteSql(client_id);
  modified[names::kScope] = quoteSql(scope);
  modified[names::kState] = quoteSql(state);
  modified[names::kExpiredTime] = expired_time;
  return DBEdit(request);
} catch (...) {
  return FailUnexpectedly(kSource, kEditWithExpiryThrew);
}

int OAUTHDBGrantCode::Revoke(long long id) try {
  traceEntry(kStoreTrace, kSource, kRevokeLine, "Revoke");
  Json::Value request = requestById(id);
  request[names::kModified][names::kExpiredTime] = std::to_string(currentTime());
  return DBEdit(request);
} catch (...) {
  return FailUnexpectedly(kSource, kRevokeThrew);
}

int OAUTHDBGrantCode::Del(long long id) try {
  traceEntry(kStoreTrace, kSource, kDelLine, "Del");
  Json::Value request = requestById(id);
  return DBDel(request);
} catch (...) {
  return FailUnexpectedly(kSource, kDelThrew);
}

int OAUTHDBGrantCode::Purge() try {
  traceEntry(kStoreTrace, kSource, kPurgeLine, "Purge");
  const long long now = currentTime();
  Json::Value rows(Json::arrayValue);
  if (Get(&rows) == 0) return 1;
  return removeAll(*this, expiredIds(rows, now), [this](long long id) { return Del(id) != 0; });
} catch (...) {
  return FailUnexpectedly(kSource, kPurgeThrew);
}

// Look-ups --------------------------------------------------------------------

int OAUTHDBGrantCode::Get(const std::string& code, Json::Value* out) try {
  traceEntry(kStoreTrace, kSource, kGetByCodeLine, "Get");
  if (!fits(code, bounds::kIdentifier)) {
    Fail(errors::kBadParameters);
    return refuse(kGetByCodeBadLine);
  }
  Json::Value request = requestBy(names::kCode, code);
  return DBGet(request, out);
} catch (...) {
  return FailUnexpectedly(kSource, kGetByCodeThrew);
}

int OAUTHDBGrantCode::GetIndex(const std::string& code) try {
  traceEntry(kStoreTrace, kSource, kGetIndexLine, "GetIndex");
  Json::Value rows(Json::arrayValue);
  return Get(code, &rows) != 0 ? firstId(rows) : 0;
} catch (...) {
  return FailUnexpectedly(kSource, kGetIndexThrew);
}

int OAUTHDBGrantCode::Get(long long id, Json::Value* out) try {
  traceEntry(kStoreTrace, kSource, kGetByIdLine, "Get");
  Json::Value request = requestById(id);
  return DBGet(request, out);
} catch (...) {
  return FailUnexpectedly(kSource, kGetByIdThrew);
}

int OAUTHDBGrantCode::Get(Json::Value* out) try {
  traceEntry(kStoreTrace, kSource, kGetAllLine, "Get");
  Json::Value request;
  return DBGet(request, out);
} catch (...) {
  return FailUnexpectedly(kSource, kGetAllThrew);
}

}  // namespace KELDOAUTHSERVER
