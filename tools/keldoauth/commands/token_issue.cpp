// keldoauth token issue and token refresh: where new pairs come from.

#include "tools/keldoauth/commands/token.h"
#include "tools/keldoauth/console/terminal.h"
#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/storage/bounds.h"
#include "utils/oauth_bounds.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

/// The new row. Without a lifetime the one in the settings applies.
Answer issueTo(Tokens& tokens, const Grant& grant, const std::string& flowType,
               const std::string& ip, const Arguments::Number& lifetime) {
  const auto& [username, client, scope, state] = grant;
  Json::Value pair;
  const bool isStored = lifetime
                            ? tokens.Add(username, client, scope, getRandomStr(kIdentifierLength),
                                         getRandomStr(kIdentifierLength), expiryIn(*lifetime),
                                         flowType, state, ip, pair)
                            : tokens.Add(username, client, scope, flowType, state, ip, pair) != 0;
  if (!isStored) throw refused(tokens, faultInToken(grant, flowType, ip));

  Json::Value rows(Json::arrayValue);
  const bool isFound =
      tokens.GetWithAccessToken(pair[names::kAccessToken].asString(), &rows) && !rows.empty();
  return answerRow<Tokens>(isFound ? rows[0U] : pair, Secrets::kShown);
}

/// A pair for the same grant as `row`, whose quotes the store doubles again.
Answer reissue(Tokens& tokens, const Json::Value& row, const Arguments::Number& lifetime) {
  const auto value = [&row](const char* column) {
    return withoutDoubledQuotes(row[column].asString());
  };
  const Grant grant{value(names::kUsername), value(names::kClientId), value(names::kScope),
                    value(names::kState)};
  return issueTo(tokens, grant, value(names::kFlowType), value(names::kIp), lifetime);
}

}  // namespace

Json::Value findToken(Tokens& tokens, TokenLookup lookup, const std::string& token) {
  Json::Value rows(Json::arrayValue);
  if (!(tokens.*lookup)(token, &rows)) {
    throw libraryFailure(tokens, outOfBounds({{"the token", token, bounds::kIdentifier}}));
  }
  return rows.empty() ? Json::Value() : rows[0U];
}

std::string faultInToken(const Grant& grant, const std::string& flowType, const std::string& ip) {
  return outOfBounds({{"--username", grant.username, bounds::kUsername},
                      {"--client", grant.client, bounds::kIdentifier},
                      {"--scope", grant.scope, bounds::kScope},
                      {"--flow-type", flowType, bounds::kFlowType},
                      {"--state", grant.state, bounds::kState}},
                     ip);
}

Answer issueToken(const Arguments& arguments) {
  const Grant grant{*arguments.username, clientToIssueFor(arguments), *arguments.scope,
                    *arguments.state};
  Tokens tokens;
  return issueTo(tokens, grant, *arguments.flowType, arguments.ip.value_or(""),
                 arguments.expiresIn);
}

/// Removing the old pair and storing the new one happen whole or not at all:
/// no two requests get a pair for the same refresh token, and a failure leaves
/// the old pair in force.
Answer refreshToken(const Arguments& arguments) {
  const std::string token = readSecret(arguments.refreshTokenFile.value_or("-"), "Refresh token");
  Tokens tokens;
  Transaction transaction(tokens);
  const Json::Value row = findToken(tokens, &OAUTHDBToken::GetWithRefreshToken, token);
  if (row.isNull()) throw Failure(kInvalid, "refresh token is unknown or was used before");
  removeSeen(tokens, row);
  Answer answer = reissue(tokens, row, arguments.expiresIn);
  transaction.commit();
  return answer;
}

}  // namespace tool
