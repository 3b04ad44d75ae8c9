// keldoauth token: pairs of access and refresh tokens, one row each.

#include <ostream>

#include "tools/keldoauth/commands/access.h"
#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/commands/edit.h"
#include "tools/keldoauth/commands/present.h"
#include "tools/keldoauth/console/output.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;
using grants::Grants;

namespace tool {
namespace {

constexpr char kLoginFlow[] = "authorization_code";
constexpr char kOwnFlow[] = "client_credentials";

constexpr Columns kListColumns{
    {"ID", names::kId},
    {"USERNAME", names::kUsername, Width::kShrinks, userText},
    {"CLIENT", "client_name", Width::kShrinks, clientText},
    {"SCOPE", names::kScope, Width::kShrinks},
    {"EXPIRES", "expires_at", Width::kFixed, expiryText},
    {"LEFT", "expired", Width::kFixed, remainingText},
    {"ENDS IN", "ends", Width::kFixed, endText},
};

constexpr Columns kDetailColumns{
    {"id", names::kId},
    {"username", names::kUsername, Width::kFixed, userText},
    {"client", "client_name", Width::kFixed, clientText},
    {"client id", names::kClientId, Width::kFixed, identifierText},
    {"scope", names::kScope},
    {"since", "since", Width::kFixed, sinceText},
    {"expires", "expires_at", Width::kFixed, expiryAndRemainingText},
    {"ends unused in", "ends", Width::kFixed, endText},
    {"flow type", names::kFlowType},
    {"state", names::kState},
    {"ip", names::kIp},
    {"stored by", "foreign", Width::kFixed, foreignText},
};

constexpr Columns kIssuedColumns{
    {"access token", names::kAccessToken},
    {"refresh token", names::kRefreshToken},
    {"expires", "expires_at", Width::kFixed, expiryAndRemainingText},
};

constexpr Columns kVerifiedColumns{
    {"username", names::kUsername, Width::kFixed, userText},
    {"client", "client_name"},
    {"scope", names::kScope},
    {"state", names::kState},
    {"expires", "expires_at", Width::kFixed, expiryAndRemainingText},
};

// Issuing ---------------------------------------------------------------------------

grants::Outcome<grants::Pair> issueLogin(Grants& grants, const grants::ApplicationId& client,
                                         const Arguments& arguments) {
  if (!arguments.username || !arguments.scope) {
    throw Failure(kUsage, "a user's login needs --username and --scope");
  }
  grants::LoginRequest request{grants::User(*arguments.username), client,
                               grants::Scope(*arguments.scope)};
  request.text = grants::CallerText(arguments.state.value_or(""));
  request.from = grants::PeerAddress(arguments.ip.value_or(""));
  request.lifetime = arguments.expiresIn;
  return grants.tokens.issue(request);
}

grants::Outcome<grants::Pair> issueOwn(Grants& grants, const grants::ApplicationId& client,
                                       const Arguments& arguments) {
  if (arguments.username || arguments.state) {
    throw Failure(kUsage, "a client's own token has neither --username nor --state");
  }
  grants::OwnTokenRequest request{client};
  if (arguments.scope) request.scope = grants::Scope(*arguments.scope);
  request.from = grants::PeerAddress(arguments.ip.value_or(""));
  request.lifetime = arguments.expiresIn;
  return grants.tokens.issueToItself(request);
}

Answer issue(const Arguments& arguments) {
  const std::string flow = arguments.flowType.value_or(kLoginFlow);
  if (flow != kLoginFlow && flow != kOwnFlow) {
    throw Failure(kRefused, "--flow-type: there is no way to issue a token of that kind",
                  std::string(kLoginFlow) + " or " + kOwnFlow);
  }
  Grants grants;
  const auto client = readableClient(grants, *arguments.client).identifier;
  const auto pair = (flow == kOwnFlow ? issueOwn : issueLogin)(grants, client, arguments);
  if (!pair) throw refusedRequest(pair.refusal(), faultInGrant(arguments));
  Answer answer;
  answer.document["token"] = presentPair(grants, *pair);
  return answer;
}

/// In the name of the application that it was issued to.
Answer refresh(const Arguments& arguments) {
  const std::string shown = readShown(arguments.refreshTokenFile.value_or("-"), "Refresh token");
  Grants grants;
  const auto entry = grants.access.find(grants::AnyToken(shown));
  if (!entry) {
    throw notGood("the refresh token", {grants::Error::kInvalidGrant, grants::Why::kUnknown});
  }
  grants::Refresh request{entry->application, grants::RefreshToken(shown)};
  request.from = entry->from;
  request.lifetime = arguments.expiresIn;
  const auto pair = grants.tokens.refresh(request);
  if (!pair) throw notGood("the refresh token", pair.refusal());
  Answer answer;
  answer.document["token"] = presentPair(grants, *pair);
  return answer;
}

void printIssued(const Json::Value& document, std::ostream& out) {
  const Json::Value& token = document["token"];
  out << "Issued " << describedAccess(token) << ".\n";
  printDetails(out, token, kIssuedColumns);
}

// Verifying -------------------------------------------------------------------------

Json::Value present(const grants::Bearer& bearer) {
  Json::Value shown;
  shown[names::kUsername] = bearer.user ? Json::Value(bearer.user->text()) : Json::Value();
  shown[names::kClientId] = bearer.application.text();
  shown["client_name"] = bearer.applicationName.text();
  shown[names::kScope] = bearer.scope.text();
  shown[names::kState] = bearer.text.text();
  shown["issued"] = secondsOrNull(bearer.issued.value_or(0));
  shown[names::kExpiredTime] = Json::Int64(bearer.expires);
  shown["expires_at"] = timeOrNull(bearer.expires);
  return shown;
}

Answer verify(const Arguments& arguments) {
  const grants::AccessToken token(readShown(arguments.tokenFile.value_or("-"), "Access token"));
  const auto bearer = Grants().tokens.verify(token);
  if (!bearer) throw notGood("the access token", bearer.refusal());
  Answer answer;
  answer.document["valid"] = true;
  answer.document["token"] = present(*bearer);
  return answer;
}

void printVerified(const Json::Value& document, std::ostream& out) {
  out << "Valid.\n";
  printDetails(out, document["token"], kVerifiedColumns);
}

// For the table ---------------------------------------------------------------------

void printTokens(const Json::Value& document, std::ostream& out) {
  printList(out, document, "tokens", kListColumns);
}

void printToken(const Json::Value& document, std::ostream& out) {
  printDetails(out, document["token"], kDetailColumns);
}

Answer list(const Arguments& arguments) {
  return listAccess(Table::kTokens, arguments);
}

Answer show(const Arguments& arguments) {
  return showAccess(Table::kTokens, arguments);
}

Answer revoke(const Arguments& arguments) {
  return revokeAccess(Table::kTokens, arguments);
}

Answer purge(const Arguments& arguments) {
  return purgeAccess(Table::kTokens, arguments);
}

void printRevoked(const Json::Value& document, std::ostream& out) {
  printEnded(Table::kTokens, "Revoked", document, out);
}

void printPurgedTokens(const Json::Value& document, std::ostream& out) {
  printPurged(Table::kTokens, kListColumns, document, out);
}

}  // namespace

const std::vector<Command>& tokenCommands() {
  using namespace option;
  static const std::vector<Command> commands{
      {"issue",
       "Issue an access and a refresh token",
       {required(kClient), kUsername, kScope, kState, kFlow, kIp, kExpiresIn, kJson},
       issue,
       printIssued},
      {"list", "List tokens", {kOfClient, kOfUser, kExpired, kJson}, list, printTokens},
      {"show",
       "Show one pair of tokens",
       {kId, kTokenFile, kRefreshTokenFile, kJson},
       show,
       printToken},
      {"verify",
       "Tell whether an access token is good: read from standard input or a file",
       {kTokenFile, kJson},
       verify,
       printVerified},
      {"edit",
       "Change what another program's pair was granted for",
       {required(kId), kClient, kUsername, kScope, kNewState, kNewFlowType, kNewExpiry, kJson},
       editToken,
       printToken},
      {"refresh",
       "Replace a pair by a new one, once: refresh token from standard input or a file",
       {kRefreshTokenFile, kExpiresIn, kJson},
       refresh,
       printIssued},
      {"revoke",
       "End pairs: neither of their tokens is good any more",
       {kIds, kTokenFile, kRefreshTokenFile, kOfUser, kOfClient, kAll, kYes, kJson},
       revoke,
       printRevoked},
      {"purge",
       "Delete expired pairs, once they cannot be refreshed any more",
       {kGrace, kDryRun, kYes, kJson},
       purge,
       printPurgedTokens},
  };
  return commands;
}

}  // namespace tool
