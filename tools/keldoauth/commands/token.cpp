// keldoauth token: pairs of access and refresh tokens, one row each.

#include <ostream>

#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/commands/grants.h"
#include "tools/keldoauth/commands/token.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/terminal.h"
#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/storage/bounds.h"
#include "tools/keldoauth/storage/stores.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

constexpr Columns kListColumns{
    {"ID", names::kId},
    {"USERNAME", names::kUsername, Width::kShrinks},
    {"CLIENT ID", names::kClientId, Width::kShrinks, identifierText},
    {"SCOPE", names::kScope, Width::kShrinks},
    {"ACCESS", names::kAccessToken},
    {"REFRESH", names::kRefreshToken},
    {"EXPIRES", "expires_at", Width::kFixed, expiryText},
    {"LEFT", "expired", Width::kFixed, remainingText},
};

constexpr Columns kDetailColumns{
    {"id", names::kId},
    {"username", names::kUsername},
    {"client id", names::kClientId, Width::kFixed, identifierText},
    {"scope", names::kScope},
    {"access token", names::kAccessToken},
    {"refresh token", names::kRefreshToken},
    {"expires", "expires_at", Width::kFixed, expiryAndRemainingText},
    {"flow type", names::kFlowType},
    {"state", names::kState},
    {"ip", names::kIp},
};

constexpr Columns kIssuedColumns{
    {"access token", names::kAccessToken},
    {"refresh token", names::kRefreshToken},
    {"expires", "expires_at", Width::kFixed, expiryAndRemainingText},
};

constexpr Columns kVerifiedColumns{
    {"username", names::kUsername},
    {"scope", names::kScope},
    {"state", names::kState},
};

std::string described(const Json::Value& token) {
  return "token " + token[names::kId].asString() + " of " +
         printable(token[names::kUsername].asString());
}

void printIssued(const Json::Value& document, std::ostream& out) {
  const Json::Value& token = document["token"];
  out << "Issued " << described(token) << ".\n";
  printDetails(out, token, kIssuedColumns);
}

// Looking up ----------------------------------------------------------------------

Json::Value rowInFile(Tokens& tokens, const Arguments& arguments) {
  Json::Value row = arguments.tokenFile
                        ? findToken(tokens, &OAUTHDBToken::GetWithAccessToken,
                                    readSecret(*arguments.tokenFile, "Access token"))
                        : findToken(tokens, &OAUTHDBToken::GetWithRefreshToken,
                                    readSecret(*arguments.refreshTokenFile, "Refresh token"));
  if (row.isNull()) throw notFound(Tokens::kNoun);
  return row;
}

/// The row that ID, --token-file or --refresh-token-file names.
Json::Value chosenRow(Tokens& tokens, const Arguments& arguments) {
  const int named = static_cast<int>(arguments.id.has_value()) +
                    static_cast<int>(arguments.tokenFile.has_value()) +
                    static_cast<int>(arguments.refreshTokenFile.has_value());
  if (named != 1) {
    throw Failure(kUsage, "name the token by one of ID, --token-file and --refresh-token-file");
  }
  return arguments.id ? rowById(tokens, *arguments.id) : rowInFile(tokens, arguments);
}

void printTokens(const Json::Value& document, std::ostream& out) {
  printList(out, document, Tokens::kPlural, kListColumns);
}

Answer show(const Arguments& arguments) {
  Tokens tokens;
  return answerRow<Tokens>(chosenRow(tokens, arguments), shownIf(arguments.reveal));
}

void printToken(const Json::Value& document, std::ostream& out) {
  printDetails(out, document["token"], kDetailColumns);
}

Answer verify(const Arguments& arguments) {
  const std::string token = readSecret(arguments.tokenFile.value_or("-"), "Access token");
  Tokens tokens;
  Answer answer;
  Json::Value holder;
  if (tokens.Verify(token, holder)) {
    answer.document["valid"] = true;
    answer.document["token"] = holder;
    return answer;
  }
  const int code = holder[names::kErrCode].asInt();
  const std::string message = holder[names::kErrMsg].asString();
  if (code == errors::kAccessTokenExpired.code) throw Failure(kInvalid, message, "", code);
  throw libraryFailure(code, message, outOfBounds({{"the token", token, bounds::kIdentifier}}));
}

void printVerified(const Json::Value& document, std::ostream& out) {
  out << "Valid.\n";
  printDetails(out, document["token"], kVerifiedColumns);
}

// Changing ------------------------------------------------------------------------

/// The form with an expiry doubles quotes, the other one stores what it is
/// given: run last, it leaves the values that were not to change as they were.
bool store(Tokens& tokens, long long id, const Grant& grant, const std::string& flowType,
           const Arguments::Number& lifetime) {
  const auto& [username, client, scope, state] = grant;
  if (lifetime && !tokens.Edit(id, username, client, scope, expiryIn(*lifetime), flowType, state)) {
    return false;
  }
  return tokens.Edit(id, username, client, scope, flowType, state);
}

Answer edit(const Arguments& arguments) {
  if (!arguments.username && !arguments.client && !arguments.scope && !arguments.flowType &&
      !arguments.state && !arguments.expiresIn) {
    throw Failure(kUsage, "nothing to change",
                  "--username, --client, --scope, --flow-type, --state or --expires-in");
  }
  const Arguments given = withClientIdentifier(arguments);
  Tokens tokens;
  Transaction transaction(tokens);
  const Json::Value row = rowById(tokens, *given.id);
  const Grant grant = changedGrant(row, given);
  const std::string flowType = given.flowType.value_or(row[names::kFlowType].asString());
  if (!store(tokens, *given.id, grant, flowType, given.expiresIn)) {
    throw refused(tokens, faultInToken(grant, flowType));
  }
  transaction.commit();
  return answerRow<Tokens>(rowById(tokens, *given.id), Secrets::kMasked);
}

Answer revoke(const Arguments& arguments) {
  Tokens tokens;
  const Json::Value row = chosenRow(tokens, arguments);
  confirm(arguments, "Revoke " + described(row) + "?");
  removeUnchanged(tokens, row);
  return answerRow<Tokens>(row, Secrets::kMasked);
}

void printRevoked(const Json::Value& document, std::ostream& out) {
  out << "Revoked " << described(document["token"]) << "; its row is gone.\n";
}

void printPurgedTokens(const Json::Value& document, std::ostream& out) {
  printPurged(document, Tokens::kNoun, kListColumns, out);
}

}  // namespace

const std::vector<Command>& tokenCommands() {
  using namespace option;
  static const std::vector<Command> commands{
      {"issue",
       "Issue an access and a refresh token",
       {required(kClient), required(kUsername), required(kScope), required(kState),
        required(kFlowType), kIp, kExpiresIn, kJson},
       issueToken,
       printIssued},
      {"list",
       "List tokens",
       {kOfClient, kOfUser, kExpired, kReveal, kJson},
       listGrants<Tokens>,
       printTokens},
      {"show",
       "Show one pair of tokens",
       {kId, kTokenFile, kRefreshTokenFile, kReveal, kJson},
       show,
       printToken},
      {"verify",
       "Tell whether an access token is good: read from standard input or a file",
       {kTokenFile, kJson},
       verify,
       printVerified},
      {"edit",
       "Change what a pair was granted for",
       {required(kId), kClient, kUsername, kScope, kState, kFlowType, kNewExpiry, kJson},
       edit,
       printToken},
      {"refresh",
       "Replace a pair by a new one, once: refresh token from standard input or a file",
       {kRefreshTokenFile, kExpiresIn, kJson},
       refreshToken,
       printIssued},
      {"revoke",
       "Remove a pair: neither of its tokens is good any more",
       {kId, kTokenFile, kRefreshTokenFile, kYes, kJson},
       revoke,
       printRevoked},
      {"purge",
       "Remove expired pairs, refresh tokens included",
       {kGrace, kDryRun, kReveal, kYes, kJson},
       purgeGrants<Tokens>,
       printPurgedTokens},
  };
  return commands;
}

}  // namespace tool
