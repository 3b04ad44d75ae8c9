#include "examples/cgi/admin_rows.h"

#include <ctime>

#include "examples/cgi/answer.h"
#include "examples/cgi/encoding.h"
#include "examples/cgi/tokens.h"
#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace service {
namespace {

using namespace KELDOAUTHSERVER;

Access accessOf(Access::Kind kind, const Json::Value& row) {
  const bool isToken = kind == Access::Kind::kToken;
  return {kind,
          undoubled(row[isToken ? names::kAccessToken : names::kCode]),
          undoubled(row[names::kUsername]),
          undoubled(row[names::kClientId]),
          undoubled(row[names::kScope]),
          number(row[names::kExpiredTime].asString())};
}

bool isLive(const Json::Value& row) {
  return number(row[names::kExpiredTime].asString()) >= std::time(nullptr);
}

long long rowCount(const char* table) {
  OAUTHDBBasic rows;
  rows.SetTabName(table);
  Json::Value count;
  if (rows.DBGetRowCount(count) == 0 || count.empty()) throw Unavailable{};
  return number(count[0].asString());
}

}  // namespace

std::string Access::handle() const {
  return base64Url(sha256(key));
}

std::vector<Client> allClients() {
  OAUTHDBClientInfo store(names::kClientInfoTable);
  Json::Value rows;
  if (store.Get(&rows) == 0) throw Unavailable{};
  std::vector<Client> clients;
  for (const Json::Value& row : rows) clients.push_back(clientOf(row));
  return clients;
}

std::vector<Access> allAccess() {
  std::vector<Access> all;
  Json::Value rows;
  OAUTHDBToken tokens(names::kTokenTable);
  if (!tokens.Get(&rows)) throw Unavailable{};
  for (const Json::Value& row : rows) {
    if (isLive(row) || tokenOf(row).isRefreshable()) {
      all.push_back(accessOf(Access::Kind::kToken, row));
    }
  }

  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  if (codes.Get(&rows) == 0) throw Unavailable{};
  for (const Json::Value& row : rows) {
    if (isLive(row)) all.push_back(accessOf(Access::Kind::kCode, row));
  }
  return all;
}

std::vector<LogEntry> logEntries(const std::string& filter, int page) {
  OAUTHDBLog log(names::kLogTable);
  Json::Value rows;
  const std::string shown = "ORDER BY id DESC LIMIT " + std::to_string(kLogRows + 1) + " OFFSET " +
                            std::to_string((page - 1) * kLogRows);
  // Messages are kept with their quotes doubled.
  if (log.Get(getSQLFormatStr(filter), shown, &rows) == 0) throw Unavailable{};
  std::vector<LogEntry> entries;
  for (const Json::Value& row : rows) {
    entries.push_back({number(row[names::kTimestamp].asString()), undoubled(row[names::kMsg])});
  }
  return entries;
}

std::vector<Fill> tableFill() {
  return {
      {"Applications", rowCount(names::kClientInfoTable), getTableRowMax(names::kClientInfoMax)},
      {"Codes", rowCount(names::kGrantCodeTable), getTableRowMax(names::kGrantCodeMax)},
      {"Tokens", rowCount(names::kTokenTable), getTableRowMax(names::kTokenMax)},
      {"Audit log", rowCount(names::kLogTable), getTableRowMax(names::kLogMax)}};
}

bool setEnabled(long long id, bool enabled) {
  OAUTHDBClientInfo store(names::kClientInfoTable);
  return (enabled ? store.Enable(id) : store.Disable(id)) != 0 || !hadNoRow(store);
}

bool removeAccess(const Access& access) {
  if (access.kind == Access::Kind::kToken) {
    OAUTHDBToken tokens(names::kTokenTable);
    return takeRow(tokens, names::kAccessToken, access.key);
  }
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  return takeRow(codes, names::kCode, access.key);
}

bool removeClient(const Client& client) {
  OAUTHDBClientInfo store(names::kClientInfoTable);
  // First of all it must not get in again.
  if (!takeRow(store, names::kClientId, client.identifier)) return false;
  OAUTHDBToken tokens(names::kTokenTable);
  takeRow(tokens, names::kClientId, client.identifier);
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  takeRow(codes, names::kClientId, client.identifier);
  return true;
}

void note(const std::string& text) {
  OAUTHDBLog log(names::kLogTable);
  log.Add(text);
}

}  // namespace service
