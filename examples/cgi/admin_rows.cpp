#include "examples/cgi/admin_rows.h"

#include <algorithm>
#include <ctime>
#include <map>
#include <utility>

#include "examples/cgi/answer.h"
#include "examples/cgi/encoding.h"
#include "examples/cgi/scopes.h"
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

bool isLive(const Json::Value& row) {
  return number(row[names::kExpiredTime].asString()) >= std::time(nullptr);
}

/// By user and application.
using Found = std::map<std::pair<std::string, std::string>, Access>;

void addTo(Found& found, const Json::Value& row, Access::State state) {
  const std::string user = undoubled(row[names::kUsername]);
  const std::string clientId = undoubled(row[names::kClientId]);
  Access& access = found[{user, clientId}];
  access.user = user;
  access.clientId = clientId;
  access.state = std::max(access.state, state);
  access.scope = tidyScope(access.scope + " " + undoubled(row[names::kScope]));
  access.expires = std::max(access.expires, number(row[names::kExpiredTime].asString()));
  ++access.grants;
}

long long rowCount(const char* table) {
  OAUTHDBBasic rows;
  rows.SetTabName(table);
  Json::Value count;
  if (rows.DBGetRowCount(count) == 0 || count.empty()) throw Unavailable{};
  return number(count[0].asString());
}

}  // namespace

std::vector<Client> allClients() {
  OAUTHDBClientInfo store(names::kClientInfoTable);
  Json::Value rows;
  if (store.Get(&rows) == 0) throw Unavailable{};
  std::vector<Client> clients;
  for (const Json::Value& row : rows) clients.push_back(clientOf(row));
  return clients;
}

std::vector<Access> allAccess() {
  Found found;
  Json::Value rows;
  OAUTHDBToken tokens(names::kTokenTable);
  if (!tokens.Get(&rows)) throw Unavailable{};
  for (const Json::Value& row : rows) {
    if (isLive(row)) {
      addTo(found, row, Access::State::kInUse);
    } else if (tokenOf(row).isRefreshable()) {
      addTo(found, row, Access::State::kRenewable);
    }
  }
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  if (codes.Get(&rows) == 0) throw Unavailable{};
  for (const Json::Value& row : rows) {
    if (isLive(row)) addTo(found, row, Access::State::kAllowed);
  }
  std::vector<Access> all;
  for (auto& [key, access] : found) all.push_back(std::move(access));
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
  return {{"Applications", rowCount(names::kClientInfoTable), getTableRowMax(names::kClientInfoMax),
           true},
          {"Codes", rowCount(names::kGrantCodeTable), getTableRowMax(names::kGrantCodeMax), true},
          {"Tokens", rowCount(names::kTokenTable), getTableRowMax(names::kTokenMax), true},
          {"Audit log", rowCount(names::kLogTable), getTableRowMax(names::kLogMax), false}};
}

bool setEnabled(long long id, bool enabled) {
  OAUTHDBClientInfo store(names::kClientInfoTable);
  return (enabled ? store.Enable(id) : store.Disable(id)) != 0 || !hadNoRow(store);
}

bool removeAccess(const std::string& user, const std::string& clientId) {
  OAUTHDBToken tokens(names::kTokenTable);
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  bool removed = false;
  // The codes first: whoever redeems one now makes a token that goes, too.
  for (OAUTHDBBasic* store :
       {static_cast<OAUTHDBBasic*>(&codes), static_cast<OAUTHDBBasic*>(&tokens)}) {
    Json::Value request;
    request[names::kCondition][names::kUsername] = getSQLFormatStr(user);
    request[names::kCondition][names::kClientId] = clientId;
    removed = store->DBDel(request) || !hadNoRow(*store) || removed;
  }
  return removed;
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
