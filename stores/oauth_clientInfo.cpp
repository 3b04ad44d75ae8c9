#include "stores/oauth_clientInfo.h"

#include <syslog.h>

#include <exception>
#include <optional>

#include "core/oauth_errors.h"
#include "stores/oauth_log.h"
#include "stores/store_support.h"
#include "utils/diagnostics.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"
#include "utils/sql_text.h"
#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {
namespace {

constexpr char kSource[] = "oauth_clientInfo";

/// The numbers that this source's lines carry.
enum Line : int {
  kAddLine = 49,
  kAddFullLine = 63,
  kAddBadLine = 76,
  kEditLine = 106,
  kEditBadLine = 115,
  kEnableLine = 130,
  kDisableLine = 141,
  kDelLine = 152,
  kGetIndexLine = 162,
  kGetByClientIdLine = 174,
  kGetByClientIdBadLine = 180,
  kGetByIdLine = 192,
  kGetAllLine = 202,

  // "Unexpected failure"
  kAuditThrew = 901,
  kAddThrew = 902,
  kAddGeneratedThrew = 903,
  kAddWithSecretThrew = 904,
  kEditThrew = 905,
  kEnableThrew = 906,
  kDisableThrew = 907,
  kDelThrew = 908,
  kGetByClientIdThrew = 909,
  kGetIndexThrew = 910,
  kGetByIdThrew = 911,
  kGetAllThrew = 912,
};

constexpr char kEnabled[] = "1";
constexpr char kDisabled[] = "0";

void logBadParameters(Line line) {
  syslog(LOG_ERR, "%s:%d Bad parameters", kSource, line);
}

std::string withoutScheme(const std::string& address) {
  for (const std::string scheme : {"https://", "http://"}) {
    if (address.compare(0, scheme.size(), scheme) == 0) return address.substr(scheme.size());
  }
  return address;
}

/// Whatever stops it, the application stays registered.
void writeAuditEntry(OAUTHDBLog& log, const std::string& displayName) {
  try {
    log.Add("Application registed[" + displayName + "]");
  } catch (const std::exception& thrown) {
    syslog(LOG_ERR, "%s:%d Unexpected failure[%s]", kSource, kAuditThrew, thrown.what());
  }
}

Json::Value requestEnable(long long id, const char* enable) {
  Json::Value request = requestById(id);
  request[names::kModified][names::kEnable] = enable;
  return request;
}

}  // namespace

OAUTHDBClientInfo::OAUTHDBClientInfo(const std::string& tableName) {
  SetTabName(tableName);
}

OAUTHDBClientInfo::OAUTHDBClientInfo(const std::string& tableName, OAUTHDBBasic& store)
    : OAUTHDBBasic(tableName, store) {}

// Registration ----------------------------------------------------------------

int OAUTHDBClientInfo::Add(const std::string& client_id, const std::string& client_secret,
                           const std::string& redirect_uri, const std::string& scope,
                           const std::string& display_name, const std::string& enable,
                           Json::Value& out) try {
  traceEntry(kStoreTrace, kSource, kAddLine, "Add");
  std::optional<OAUTHDBLog> log;
  IsLent() ? log.emplace(names::kLogTable, *this) : log.emplace(names::kLogTable);
  const std::string address = withoutScheme(redirect_uri);

  if (DBCheckRowMax(static_cast<unsigned long>(getTableRowMax(names::kClientInfoMax))) == 0) {
    syslog(LOG_ERR, "%s:%d ClientInfo Table is full", kSource, kAddFullLine);
    return Fail(errors::kClientInfoFull);
  }
  if (!fits(client_id, bounds::kIdentifier) || !fits(client_secret, bounds::kIdentifier) ||
      !fits(address, bounds::kRedirectUri) || !fits(scope, bounds::kScope) ||
      !fits(display_name, bounds::kDisplayName) || (enable != kEnabled && enable != kDisabled)) {
    logBadParameters(kAddBadLine);
    return Fail(errors::kBadParameters);
  }

  Json::Value row;
  row[names::kEnable] = enable;
  row[names::kClientId] = quoteSql(client_id);
  row[names::kClientSecret] = quoteSql(client_secret);
  row[names::kRedirectUri] = quoteSql(address);
  row[names::kScope] = quoteSql(scope);
  row[names::kDisplayName] = quoteSql(display_name);
  row[names::kId] = Json::Value();

  out[names::kClientId] = client_id;
  out[names::kClientSecret] = client_secret;

  if (!DBAdd(row)) return 0;
  writeAuditEntry(*log, display_name);
  return 1;
} catch (...) {
  return FailUnexpectedly(kSource, kAddThrew);
}

int OAUTHDBClientInfo::Add(const std::string& redirect_uri, const std::string& scope,
                           const std::string& display_name, Json::Value& out) try {
  const std::string client_id = getRandomStr(kIdentifierLength);
  const std::string client_secret = getRandomStr(kIdentifierLength);
  return Add(client_id, client_secret, redirect_uri, scope, display_name, kEnabled, out);
} catch (...) {
  return FailUnexpectedly(kSource, kAddGeneratedThrew);
}

int OAUTHDBClientInfo::Add(const std::string& client_secret, const std::string& redirect_uri,
                           const std::string& scope, const std::string& display_name,
                           Json::Value& out) try {
  const std::string client_id = getRandomStr(kIdentifierLength);
  return Add(client_id, client_secret, redirect_uri, scope, display_name, kEnabled, out);
} catch (...) {
  return FailUnexpectedly(kSource, kAddWithSecretThrew);
}

// Changes ---------------------------------------------------------------------

int OAUTHDBClientInfo::Edit(long long id, const std::string& redirect_uri, const std::string& scope,
                            const std::string& display_name) try {
  traceEntry(kStoreTrace, kSource, kEditLine, "Edit");
  if (!fits(redirect_uri, bounds::kRedirectUri) || !fits(scope, bounds::kScope) ||
      !fits(display_name, bounds::kDisplayName)) {
    logBadParameters(kEditBadLine);
    return Fail(errors::kBadParameters);
  }
  Json::Value request = requestById(id);
  Json::Value& modified = request[names::kModified];
  modified[names::kRedirectUri] = quoteSql(redirect_uri);
  modified[names::kScope] = quoteSql(scope);
  modified[names::kDisplayName] = quoteSql(display_name);
  return DBEdit(request);
} catch (...) {
  return FailUnexpectedly(kSource, kEditThrew);
}

int OAUTHDBClientInfo::Enable(long long id) try {
  traceEntry(kStoreTrace, kSource, kEnableLine, "Enable");
  Json::Value request = requestEnable(id, kEnabled);
  return DBEdit(request);
} catch (...) {
  return FailUnexpectedly(kSource, kEnableThrew);
}

int OAUTHDBClientInfo::Disable(long long id) try {
  traceEntry(kStoreTrace, kSource, kDisableLine, "Disable");
  Json::Value request = requestEnable(id, kDisabled);
  return DBEdit(request);
} catch (...) {
  return FailUnexpectedly(kSource, kDisableThrew);
}

int OAUTHDBClientInfo::Del(long long id) try {
  traceEntry(kStoreTrace, kSource, kDelLine, "Del");
  Json::Value request = requestById(id);
  return DBDel(request);
} catch (...) {
  return FailUnexpectedly(kSource, kDelThrew);
}

// Look-ups --------------------------------------------------------------------

int OAUTHDBClientInfo::Get(const std::string& client_id, Json::Value* out) try {
  traceEntry(kStoreTrace, kSource, kGetByClientIdLine, "Get");
  if (!fits(client_id, bounds::kIdentifier)) {
    logBadParameters(kGetByClientIdBadLine);
    return Fail(errors::kBadParameters);
  }
  Json::Value request = requestBy(names::kClientId, quoteSql(client_id));
  return DBGet(request, out);
} catch (...) {
  return FailUnexpectedly(kSource, kGetByClientIdThrew);
}

int OAUTHDBClientInfo::GetIndex(const std::string& client_id) try {
  traceEntry(kStoreTrace, kSource, kGetIndexLine, "GetIndex");
  Json::Value rows(Json::arrayValue);
  return Get(client_id, &rows) != 0 ? firstId(rows) : 0;
} catch (...) {
  return FailUnexpectedly(kSource, kGetIndexThrew);
}

int OAUTHDBClientInfo::Get(long long id, Json::Value* out) try {
  traceEntry(kStoreTrace, kSource, kGetByIdLine, "Get");
  Json::Value request = requestById(id);
  return DBGet(request, out);
} catch (...) {
  return FailUnexpectedly(kSource, kGetByIdThrew);
}

int OAUTHDBClientInfo::Get(Json::Value* out) try {
  traceEntry(kStoreTrace, kSource, kGetAllLine, "Get");
  Json::Value request;
  return DBGet(request, out);
} catch (...) {
  return FailUnexpectedly(kSource, kGetAllThrew);
}

}  // namespace KELDOAUTHSERVER
