#include "stores/oauth_token.h"

#include <syslog.h>

#include <system_error>
#include <utility>

#include "core/oauth_errors.h"
#include "stores/store_support.h"
#include "utils/clock.h"
#include "utils/decimal.h"
#include "utils/diagnostics.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"
#include "utils/sql_text.h"
#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {
namespace {

constexpr char kSource[] = "oauth_token";

/// The numbers that this source's lines carry.
enum Line : int {
  kIssueLine = 28,
  kStoreLine = 52,
  kStoreFullLine = 60,
  kStoreBadAddressLine = 65,
  kStoreBadLine = 80,
  kEditLine = 111,
  kEditBadLine = 122,
  kEditWithExpiryLine = 147,
  kEditWithExpiryBadLine = 159,
  kRevokeLine = 177,
  kDelLine = 184,
  kGetIndexLine = 194,
  kGetByAccessLine = 206,
  kGetByAccessBadLine = 212,
  kGetByRefreshLine = 224,
  kGetByRefreshBadLine = 230,
  kGetByIdLine = 242,
  kGetAllLine = 252,
  kPurgeLine = 261,
  kVerifyLine = 282,

  // "Unexpected failure"
  kIssueThrew = 901,
  kStoreThrew = 902,
  kEditThrew = 903,
  kEditWithExpiryThrew = 904,
  kDelThrew = 905,
  kPurgeThrew = 906,
  kGetByAccessThrew = 907,
  kGetByRefreshThrew = 908,
  kGetIndexThrew = 909,
  kGetByIdThrew = 910,
  kGetAllThrew = 911,
  kVerifyThrew = 912,
};

void logBadParameters(Line line) {
  syslog(LOG_ERR, "%s:%d Bad parameters", kSource, line);
}

}  // namespace

OAUTHDBToken::OAUTHDBToken(const std::string& tableName) {
  SetTabName(tableName);
}

OAUTHDBToken::OAUTHDBToken(const std::string& tableName, OAUTHDBBasic& store)
    : OAUTHDBBasic(tableName, store) {}

// Issuing ---------------------------------------------------------------------

int OAUTHDBToken::Add(const std::string& username, const std::string& client_id,
                      const std::string& scope, const std::string& flow_type,
                      const std::string& state, const std::string& ip, Json::Value& result) try {
  traceEntry(kStoreTrace, kSource, kIssueLine, "Add");
  const long long expiry = currentTime() + getExpiredPeriod(names::kTokenExpired);
  const std::string access_token = getRandomStr(kIdentifierLength);
  const std::string refresh_token = getRandomStr(kIdentifierLength);
  return Add(username, client_id, scope, refresh_token, access_token, std::to_string(expiry),
             flow_type, state, ip, result);
} catch (...) {
  return FailUnexpectedly(kSource, kIssueThrew);
}

bool OAUTHDBToken::Add(const std::string& username, const std::string& client_id,
                       const std::string& scope, const std::string& refresh_token,
                       const std::string& access_token, const std::string& expired_time,
                       const std::string& flow_type, const std::string& state,
                       const std::string& ip, Json::Value& result) try {
  traceEntry(kStoreTrace, kSource, kStoreLine, "Add");
  const int badAddress = addressError(ip);

  if (DBCheckRowMax(static_cast<unsigned long>(getTableRowMax(names::kTokenMax))) == 0) {
    syslog(LOG_ERR, "%s:%d Token Table is full", kSource, kStoreFullLine);
    return Fail(errors::kTokenFull);
  }
  if (!ip.empty() && badAddress != 0) {
    syslog(LOG_ERR, "%s:%d Bad IP address[%s]", kSource, kStoreBadAddressLine,
           std::generic_category().message(badAddress).c_str());
    return false;
  }
  if (!fits(username, bounds::kUsername) || !fits(client_id, bounds::kIdentifier) ||
      !fits(scope, bounds::kScope) || !fits(refresh_token, bounds::kIdentifier) ||
      !fits(access_token, bounds::kIdentifier) || !fits(expired_time, bounds::kExpiredTime) ||
      !fits(flow_type, bounds::kFlowType) || !fits(state, bounds::kState)) {
    logBadParameters(kStoreBadLine);
    return Fail(errors::kBadParameters);
  }

  Json::Value row;
  row[names::kUsername] = quoteSql(username);
  row[names::kClientId] = quoteSql(client_id);
  row[names::kScope] = quoteSql(scope);
  row[names::kRefreshToken] = quoteSql(refresh_token);
  row[names::kAccessToken] = quoteSql(access_token);
  row[names::kExpiredTime] = quoteSql(expired_time);
  row[names::kFlowType] = quoteSql(flow_type);
  row[names::kState] = quoteSql(state);
  row[names::kIp] = quoteSql(ip);
  row[names::kId] = Json::Value();

  result[names::kRefreshToken] = refresh_token;
  result[names::kAccessToken] = access_token;
  return DBAdd(row);
} catch (...) {
  return FailUnexpectedly(kSource, kStoreThrew);
}

// Changes ---------------------------------------------------------------------

bool OAUTHDBToken::Edit(long long id, const std::string& username, const std::string& client_id,
                        const std::string& scope, const std::string& flow_type,
                        const std::string& state) try {
  traceEntry(kStoreTrace, kSource, kEditLine, "Edit");
  if (!fits(username, bounds::kUsername) || !fits(client_id, bounds::kIdentifier) ||
      !fits(scope, bounds::kScope) || !fits(flow_type, bounds::kFlowType) ||
      !fits(state, bounds::kState)) {
    logBadParameters(kEditBadLine);
    return Fail(errors::kBadParameters);
  }
  Json::Value request = requestById(id);
  Json::Value& modified = request[names::kModified];
  modified[names::kClientId] = client_id;
  modified[names::kScope] = scope;
  modified[names::kState] = state;
  modified[names::kUsername] = username;
  modified[names::kFlowType] = flow_type;
  return DBEdit(request);
} catch (...) {
  return FailUnexpectedly(kSource, kEditThrew);
}

bool OAUTHDBToken::Edit(long long id, const std::string& username, const std::string& client_id,
                        const std::string& scope, const std::string& expired_time,
                        const std::string& flow_type, const std::string& state) try {
  traceEntry(kStoreTrace, kSource, kEditWithExpiryLine, "Edit");
  if (!fits(username, bounds::kUsername) || !fits(client_id, bounds::kIdentifier) ||
      !fits(scope, bounds::kScope) || !fits(expired_time, bounds::kExpiredTime) ||
      !fits(flow_type, bounds::kFlowType) || !fits(state, bounds::kState)) {
    logBadParameters(kEditWithExpiryBadLine);
    return Fail(errors::kBadParameters);
  }
  Json::Value request = requestById(id);
  Json::Value& modified = request[names::kModified];
  modified[names::kClientId] = quoteSql(client_id);
  modified[names::kScope] = quoteSql(scope);
  modified[names::kState] = quoteSql(state);
  modified[names::kUsername] = quoteSql(username);
  modified[names::kFlowType] = quoteSql(flow_type);
  modified[names::kExpiredTime] = expired_time;
  return DBEdit(request);
} catch (...) {
  return FailUnexpectedly(kSource, kEditWithExpiryThrew);
}

bool OAUTHDBToken::Del(long long id) try {
  traceEntry(kStoreTrace, kSource, kDelLine, "Del");
  Json::Value request = requestById(id);
  return DBDel(request);
} catch (...) {
  return FailUnexpectedly(kSource, kDelThrew);
}

bool OAUTHDBToken::Revoke(long long id) {
  traceEntry(kStoreTrace, kSource, kRevokeLine, "Revoke");
  return Del(id);
}

bool OAUTHDBToken::Purge() try {
  traceEntry(kStoreTrace, kSource, kPurgeLine, "Purge");
  const long long now = currentTime();
  Json::Value rows(Json::arrayValue);
  if (!Get(&rows)) return true;
  return removeAll(*this, expiredIds(rows, now), [this](long long id) { return Del(id); });
} catch (...) {
  return FailUnexpectedly(kSource, kPurgeThrew);
}

// Look-ups --------------------------------------------------------------------

bool OAUTHDBToken::GetWithAccessToken(const std::string& access_token, Json::Value* rows) try {
  traceEntry(kStoreTrace, kSource, kGetByAccessLine, "GetWithAccessToken");
  if (!fits(access_token, bounds::kIdentifier)) {
    logBadParameters(kGetByAccessBadLine);
    return Fail(errors::kBadParameters);
  }
  Json::Value request = requestBy(names::kAccessToken, quoteSql(access_token));
  return DBGet(request, rows);
} catch (...) {
  return FailUnexpectedly(kSource, kGetByAccessThrew);
}

bool OAUTHDBToken::GetWithRefreshToken(const std::string& refresh_token, Json::Value* rows) try {
  traceEntry(kStoreTrace, kSource, kGetByRefreshLine, "GetWithRefreshToken");
  if (!fits(refresh_token, bounds::kIdentifier)) {
    logBadParameters(kGetByRefreshBadLine);
    return Fail(errors::kBadParameters);
  }
  Json::Value request = requestBy(names::kRefreshToken, quoteSql(refresh_token));
  return DBGet(request, rows);
} catch (...) {
  return FailUnexpectedly(kSource, kGetByRefreshThrew);
}

int OAUTHDBToken::GetIndex(const std::string& access_token) try {
  traceEntry(kStoreTrace, kSource, kGetIndexLine, "GetIndex");
  Json::Value rows(Json::arrayValue);
  return GetWithAccessToken(access_token, &rows) ? firstId(rows) : 0;
} catch (...) {
  return FailUnexpectedly(kSource, kGetIndexThrew);
}

bool OAUTHDBToken::Get(long long id, Json::Value* rows) try {
  traceEntry(kStoreTrace, kSource, kGetByIdLine, "Get");
  Json::Value request = requestById(id);
  return DBGet(request, rows);
} catch (...) {
  return FailUnexpectedly(kSource, kGetByIdThrew);
}

bool OAUTHDBToken::Get(Json::Value* rows) try {
  traceEntry(kStoreTrace, kSource, kGetAllLine, "Get");
  Json::Value request;
  return DBGet(request, rows);
} catch (...) {
  return FailUnexpectedly(kSource, kGetAllThrew);
}

// Verification ----------------------------------------------------------------

bool OAUTHDBToken::Verify(const std::string& access_token, Json::Value& result) try {
  traceEntry(kStoreTrace, kSource, kVerifyLine, "Verify");
  const long long now = currentTime();
  Json::Value rows(Json::arrayValue);
  if (!GetWithAccessToken(access_token, &rows)) {
    result[names::kErrMsg] = GetErrMsg();
    result[names::kErrCode] = GetErrCode();
    return false;
  }
  const Json::Value& found = std::as_const(rows)[0U];  // null when there is no row
  if (decimalValue(found[names::kExpiredTime]) < now) {
    result[names::kErrMsg] = errors::kAccessTokenExpired.message;
    result[names::kErrCode] = errors::kAccessTokenExpired.code;
    return false;
  }
  for (const char* column : {names::kUsername, names::kScope, names::kState}) {
    result[column] = found[column];
  }
  return true;
} catch (...) {
  return FailUnexpectedly(kSource, kVerifyThrew);
}

}  // namespace KELDOAUTHSERVER
