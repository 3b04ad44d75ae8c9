// /oauth/token: turns a code, a refresh token or a client's own credentials into
// an access token (RFC 6749, 4.1.3, 4.4.2 and 6).

#include <ctime>

#include "core/oauth_errors.h"
#include "examples/cgi/answer.h"
#include "examples/cgi/clients.h"
#include "examples/cgi/code_state.h"
#include "examples/cgi/encoding.h"
#include "examples/cgi/scopes.h"
#include "examples/cgi/tokens.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_token.h"
#include "utils/oauth_bounds.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace {

using namespace service;
using namespace KELDOAUTHSERVER;

constexpr std::size_t kLeastVerifier = 43;
constexpr std::size_t kMostVerifier = 128;
/// Two requests with one code or refresh token so close together are a client
/// that tried twice; later, it has been seen by somebody else.
constexpr long long kGraceSeconds = 10;

/// What a new pair is issued for.
struct Grant {
  std::string user;
  std::string scope;
  std::string flow;
  TokenState state;
};

[[noreturn]] void refuse(const std::string& error, const std::string& why) {
  throw Refusal{oauthError(400, error, why)};
}

/// A new pair; null when it could not be stored.
Json::Value issue(const Client& client, const Grant& grant) {
  OAUTHDBToken tokens(names::kTokenTable);
  Json::Value pair;
  const bool stored = tokens.Add(grant.user, client.identifier, grant.scope, grant.flow,
                                 pack(grant.state), getRemoteIP(), pair) != 0;
  return stored ? pair : Json::Value();
}

Answer success(const Json::Value& pair, const Grant& grant) {
  Json::Value document;
  document["access_token"] = pair[names::kAccessToken];
  document["token_type"] = "Bearer";
  document["expires_in"] = getExpiredPeriod(names::kTokenExpired);
  document["scope"] = grant.scope;
  // Its own credentials serve a client as well as a refresh token would.
  if (grant.flow != kFlowClient) document["refresh_token"] = pair[names::kRefreshToken];
  return jsonAnswer(200, document).with("Pragma", "no-cache");
}

// A code ----------------------------------------------------------------------

struct Code {
  std::string user, clientId, scope, text, expires, packed, address;
  CodeState state;
};

std::optional<Code> findCode(const std::string& text) {
  if (text.size() != kIdentifierLength) return std::nullopt;
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  Json::Value rows;
  if (codes.Get(text, &rows) == 0) throw Unavailable{};
  if (rows.empty()) return std::nullopt;

  const Json::Value& row = rows[0];
  const std::string packed = undoubled(row[names::kState]);
  const std::optional<CodeState> state = unpackCodeState(packed);
  if (!state) return std::nullopt;
  return Code{undoubled(row[names::kUsername]),    undoubled(row[names::kClientId]),
              undoubled(row[names::kScope]),       text,
              row[names::kExpiredTime].asString(), packed,
              row[names::kIp].asString(),          *state};
}

bool isVerifier(const std::string& verifier, const std::string& challenge) {
  return verifier.size() >= kLeastVerifier && verifier.size() <= kMostVerifier &&
         percentEncode(verifier) == verifier &&
         equalSecrets(base64Url(sha256(verifier)), challenge);
}

void checkCode(const Client& client, const Parameters& form, const Code& code) {
  if (code.clientId != client.identifier) {
    refuse("invalid_grant", "The code was issued to another client");
  }
  if (number(code.expires) < std::time(nullptr)) {
    refuse("invalid_grant", "The code has expired");
  }
  const std::string redirect = form.value("redirect_uri");
  if (redirect != code.state.redirect && (code.state.redirectWasGiven || !redirect.empty())) {
    refuse("invalid_grant", "redirect_uri is not the one of the authorization request");
  }
  if (!isVerifier(form.value("code_verifier"), code.state.challenge)) {
    refuse("invalid_grant", "code_verifier does not fit the code_challenge");
  }
}

/// The code goes first: of several requests with it, one removes the row.
void takeCode(const Code& code) {
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  if (!takeRow(codes, names::kCode, code.text)) {
    refuse("invalid_grant", "The code was used before");
  }
}

/// For a client that shall try again: the token could not be stored.
void giveBack(const Code& code) {
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  Json::Value ignored;
  codes.Add(code.user, code.clientId, code.scope, code.text, code.expires, code.packed,
            code.address, ignored);
}

Answer redeemCode(const Client& client, const Parameters& form) {
  const std::string text = form.value("code");
  if (text.empty()) refuse("invalid_request", "code is missing");
  if (!form.has("code_verifier")) refuse("invalid_request", "code_verifier is missing");

  const std::string digest = base64Url(sha256(text));
  const std::optional<Code> code = findCode(text);
  if (!code) {
    removeTokensOfCode(client.identifier, digest, std::time(nullptr) - kGraceSeconds);
    refuse("invalid_grant", "The code is unknown or was used before");
  }
  checkCode(client, form, *code);
  requireRoom(0);
  takeCode(*code);
  const Grant grant{code->user, code->scope, kFlowCode, {code->scope, digest, std::time(nullptr)}};
  const Json::Value pair = issue(client, grant);
  if (pair.isNull()) {
    giveBack(*code);
    throw Unavailable{};
  }
  return success(pair, grant);
}

// A refresh token -------------------------------------------------------------

void giveBack(const Token& token) {
  OAUTHDBToken tokens(names::kTokenTable);
  Json::Value ignored;
  tokens.Add(token.user, token.clientId, token.scope, token.refresh, token.access,
             std::to_string(token.expires), token.flow, pack(token.state), token.address, ignored);
}

/// The pair that follows; null when it could not be stored.
Json::Value issueNext(const Client& client, const Grant& grant, const Pair& pair) {
  const long long expires = grant.state.issued + getExpiredPeriod(names::kTokenExpired);
  OAUTHDBToken tokens(names::kTokenTable);
  Json::Value stored;
  return tokens.Add(grant.user, client.identifier, grant.scope, pair.refresh, pair.access,
                    std::to_string(expires), grant.flow, pack(grant.state), getRemoteIP(), stored)
             ? stored
             : Json::Value();
}

std::string refreshedScope(const Parameters& form, const Token& old) {
  if (!form.has("scope")) return old.state.grantScope;
  std::string asked = tidyScope(form.value("scope"));
  if (asked.empty() || !isWithin(asked, old.state.grantScope)) {
    refuse("invalid_scope", "The scope is wider than the one granted");
  }
  return asked;
}

Answer refresh(const Client& client, const Parameters& form) {
  if (!form.has("refresh_token")) refuse("invalid_request", "refresh_token is missing");
  const std::string text = form.value("refresh_token");
  const std::optional<Token> old = findRefreshToken(text);
  if (!old) removeTokensOfFamily(client.identifier, text, std::time(nullptr) - kGraceSeconds);
  if (!old || old->clientId != client.identifier || !old->isRefreshable()) {
    refuse("invalid_grant", "The refresh token is unknown, expired or was used before");
  }
  const Grant grant{old->user,
                    refreshedScope(form, *old),
                    old->flow,
                    {old->state.grantScope, old->state.codeDigest, std::time(nullptr)}};
  const Pair next = nextPair(text);
  requireRoom(1);
  // Removing first keeps the pairs at one, and makes the room for the new one.
  if (!removeToken(*old)) refuse("invalid_grant", "The refresh token was used before");
  const Json::Value pair = issueNext(client, grant, next);
  if (pair.isNull()) {
    giveBack(*old);
    throw Unavailable{};
  }
  return success(pair, grant);
}

// The client itself -----------------------------------------------------------

Answer actAsClient(const Client& client, const Parameters& form) {
  const std::string scope = form.has("scope") ? tidyScope(form.value("scope")) : client.scope;
  if (scope.empty() || !isWithin(scope, client.scope)) {
    refuse("invalid_scope", "The client is not registered for this scope");
  }
  requireRoom(0);
  const Grant grant{client.identifier, scope, kFlowClient, {scope, "", std::time(nullptr)}};
  const Json::Value pair = issue(client, grant);
  if (pair.isNull()) throw Unavailable{};
  return success(pair, grant);
}

Answer handle(const Request& request) {
  const Parameters form = readForm(
      request, {"grant_type", "code", "redirect_uri", "code_verifier", "refresh_token", "scope"});
  const Client client = authenticate(request, form);
  const std::string type = form.value("grant_type");
  if (type == "authorization_code") return redeemCode(client, form);
  if (type == "refresh_token") return refresh(client, form);
  if (type == "client_credentials") return actAsClient(client, form);
  if (type.empty()) refuse("invalid_request", "grant_type is missing");
  refuse("unsupported_grant_type", "This grant type is not supported");
}

}  // namespace

int main() {
  return serve(handle);
}
