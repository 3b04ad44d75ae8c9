// A protected resource of one's own as a CGI program: the albums of whoever a token
// with the scope "photos.read" stands for (RFC 6750).
//
//   GET /albums HTTP/1.1
//   Authorization: Bearer ...

#include <cstdio>
#include <cstdlib>
#include <string>

#include "grants/grants.h"

using namespace KELDOAUTHSERVER::grants;

namespace {

constexpr char kScope[] = "photos.read";

/// What follows "Bearer "; empty without it.
std::string bearerToken() {
  const char* const variable = std::getenv("HTTP_AUTHORIZATION");
  const std::string header = variable == nullptr ? "" : variable;
  return header.rfind("Bearer ", 0) == 0 ? header.substr(7) : "";
}

bool covers(const Scope& scope) {
  return (" " + scope.text() + " ").find(std::string(" ") + kScope + " ") != std::string::npos;
}

int answer(const char* status, const std::string& headers, const std::string& body) {
  std::printf("Status: %s\r\nCache-Control: no-store\r\n%s\r\n%s", status, headers.c_str(),
              body.c_str());
  return 0;
}

int refuse(const char* status, const std::string& error) {
  return answer(status, "WWW-Authenticate: Bearer realm=\"albums\"" + error + "\r\n", "");
}

}  // namespace

int main() try {
  const std::string token = bearerToken();
  if (token.empty()) return refuse("401 Unauthorized", "");

  const Grants grants;
  const auto bearer = grants.tokens.verify(AccessToken(token));
  if (!bearer) return refuse("401 Unauthorized", R"(, error="invalid_token")");
  // A token without a user is an application's own: it has no albums.
  if (!bearer->user || !covers(bearer->scope)) {
    return refuse("403 Forbidden",
                  std::string(R"(, error="insufficient_scope", scope=")") + kScope + "\"");
  }
  return answer("200 OK", "Content-Type: text/plain; charset=utf-8\r\n",
                "The albums of " + bearer->user->text() + "\n");
} catch (const Trouble& trouble) {
  // Not "invalid_token": nobody could look.
  return trouble.canTryAgain() ? answer("503 Service Unavailable", "Retry-After: 5\r\n", "")
                               : answer("500 Internal Server Error", "", "");
}
