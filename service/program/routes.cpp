#include "service/program/routes.h"

#include <algorithm>
#include <iterator>

#include "service/oidc/endpoints.h"
#include "service/pages/account.h"
#include "service/pages/admin_pages.h"
#include "service/pages/html.h"
#include "service/pages/sign_in.h"
#include "service/protocol/endpoints.h"

namespace keldoauth::service {
namespace {

constexpr std::string_view kWellKnown = "/.well-known/";

constexpr Route kRoutes[] = {
    {"/.well-known/oauth-authorization-server", metadata, tellAsJson, "GET, HEAD"},
    {"/.well-known/openid-configuration", openIdConfiguration, tellAsJson, "GET, HEAD"},
    {"/oauth/authorize", authorize, failurePage},
    {"/oauth/introspect", introspect, tellAsJson, nullptr, true},
    {"/oauth/jwks", publicKeys, tellAsJson, "GET, HEAD"},
    {"/oauth/logout", logout, failurePage},
    {"/oauth/par", pushRequest, tellAsJson, "POST", true},
    {"/oauth/register", registerApplication, tellAsJson, nullptr, true},
    {"/oauth/register/", manageRegistration, tellAsJson, nullptr, true},
    {"/oauth/revoke", revoke, tellAsJson, "POST", true},
    {"/oauth/sign-in", signInPage, failurePage},
    {"/oauth/sign-out", signOutPage, failurePage},
    {"/oauth/token", token, tellAsJson, "POST", true},
    {"/oauth/userinfo", userInfo, tellAsJson, "GET, HEAD, POST"},
    {"/api/whoami", whoami, tellAsJson},
    {"/account", account, failurePage},
    {"/admin", admin, failurePage},
};

bool startsWith(std::string_view text, std::string_view start) {
  return text.substr(0, start.size()) == start;
}

bool endsWith(std::string_view text, std::string_view end) {
  return text.size() >= end.size() && text.substr(text.size() - end.size()) == end;
}

/// The path below the issuer's; empty when it is not below.
std::string_view pathBelow(std::string_view path, std::string_view base) {
  if (startsWith(path, base)) return path.substr(base.size());
  const bool isBefore = startsWith(path, kWellKnown) && endsWith(path, base);
  return isBefore ? path.substr(0, path.size() - base.size()) : std::string_view();
}

bool isOn(const Route& route, std::string_view path) {
  if (route.path.back() != '/') return route.path == path;
  return startsWith(path, route.path) && path.size() > route.path.size();
}

}  // namespace

Answer tellAsJson(const Settings& /*settings*/, const Failure& failure) {
  return failureAsJson(failure);
}

const Route* routeOf(const std::string& path, const std::string& basePath) {
  const std::string_view below = pathBelow(path, basePath);
  const auto* const found = std::find_if(std::begin(kRoutes), std::end(kRoutes),
                                         [&](const Route& route) { return isOn(route, below); });
  return found == std::end(kRoutes) ? nullptr : found;
}

}  // namespace keldoauth::service
