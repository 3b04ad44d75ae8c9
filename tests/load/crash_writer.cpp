#include "tests/load/crash_writer.h"

#include <unistd.h>

#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "utils/oauth_names.h"

namespace load {
namespace {

namespace names = KELDOAUTHSERVER::names;
using KELDOAUTHSERVER::OAUTHDBClientInfo;
using KELDOAUTHSERVER::OAUTHDBGrantCode;
using KELDOAUTHSERVER::OAUTHDBLog;
using KELDOAUTHSERVER::OAUTHDBToken;

constexpr char kAddress[] = "192.0.2.7";

bool tell(int pipe, News news, const Operation& operation) {
  const Message message{news, operation};
  return write(pipe, &message, sizeof message) == static_cast<ssize_t>(sizeof message);
}

bool onClients(const Operation& operation) {
  OAUTHDBClientInfo clients(names::kClientInfoTable);
  const std::string id = texts::identifier(operation.serial);
  Json::Value out;
  switch (operation.action) {
    case Action::kRegisterClient: {
      const std::string user = texts::user(operation.serial);
      return clients.Add(id, id, "https://app.example/" + user, "read", user, "1", out) != 0;
    }
    case Action::kDisableClient:
      return clients.Disable(clients.GetIndex(id)) != 0;
    default:
      return clients.Del(clients.GetIndex(id)) != 0;
  }
}

bool onCodes(const Operation& operation) {
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  const std::string id = texts::identifier(operation.serial);
  const std::string user = texts::user(operation.serial);
  Json::Value out;
  switch (operation.action) {
    case Action::kIssueCode:
      return codes.Add(user, id, "read", id, texts::kFarExpiry, "state", kAddress, out) != 0;
    case Action::kIssueExpiredCode:
      return codes.Add(user, id, "read", id, texts::kPastExpiry, "state", kAddress, out) != 0;
    case Action::kEditCode:
      return codes.Edit(codes.GetIndex(id), user, id, texts::kEditedScope, "state") != 0;
    case Action::kRevokeCode:
      return codes.Revoke(codes.GetIndex(id)) != 0;
    case Action::kRedeemCode:
      return codes.Del(codes.GetIndex(id)) != 0;
    default:
      return codes.Purge() != 0;
  }
}

bool onTokens(const Operation& operation) {
  OAUTHDBToken tokens(names::kTokenTable);
  const std::string id = texts::identifier(operation.serial);
  const std::string user = texts::user(operation.serial);
  const auto issue = [&](const char* expiry) {
    Json::Value out;
    return tokens.Add(user, id, "read", id, id, expiry, "code", "state", kAddress, out);
  };
  switch (operation.action) {
    case Action::kIssueTokens:
      return issue(texts::kFarExpiry);
    case Action::kIssueExpiredTokens:
      return issue(texts::kPastExpiry);
    case Action::kRevokeTokens:
      return tokens.Revoke(tokens.GetIndex(id));
    default:
      return tokens.Purge();
  }
}

bool onLog(const Operation& operation) {
  OAUTHDBLog log(names::kLogTable);
  if (operation.action == Action::kClearLog) return log.Del() != 0;
  return log.Add("entry of " + texts::user(operation.serial)) != 0;
}

bool perform(const Operation& operation) {
  if (operation.action <= Action::kRemoveClient) return onClients(operation);
  if (operation.action <= Action::kPurgeCodes) return onCodes(operation);
  if (operation.action <= Action::kPurgeTokens) return onTokens(operation);
  return onLog(operation);
}

}  // namespace

void writeForEver(int pipe, State state, int serial, unsigned seed) {
  std::mt19937 random(seed);
  for (;;) {
    const Operation operation = drawOperation(state, serial, random);
    if (!tell(pipe, News::kBegins, operation)) return;
    const News news = perform(operation) ? News::kSucceeded : News::kFailed;
    if (!tell(pipe, news, operation)) return;
    state = statesAfter(state, operation).back();
  }
}

}  // namespace load
