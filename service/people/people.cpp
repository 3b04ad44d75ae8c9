#include "service/people/people.h"

#include <ctime>
#include <utility>

#include "service/http/cookies.h"
#include "service/people/htpasswd.h"
#include "service/people/names.h"
#include "service/people/system_users.h"
#include "utils/wide_time.h"

namespace keldoauth::service {
namespace {

void trustWebServer(Request& request) {
  if (isUserName(request.user)) {
    request.authTime = static_cast<long long>(std::time(nullptr));
  } else {
    request.user.clear();
  }
}

}  // namespace

std::unique_ptr<Directory> directoryOf(const Settings& settings) {
  switch (settings.signIn) {
    case SignIn::kSystem:
      return std::make_unique<SystemUsers>();
    case SignIn::kHtpasswd:
      return std::make_unique<HtpasswdUsers>(settings.htpasswdFile, settings.sessionKey);
    case SignIn::kWebServer:
      break;
  }
  return nullptr;
}

Sessions sessionsOf(const Settings& settings, const Directory& directory) {
  return {settings.sessionKey, directory, settings.sessionSeconds};
}

Throttle throttleOf(const Settings& settings) {
  return {settings.countersFile, settings.sessionKey};
}

void recognise(const Settings& settings, Request& request) {
  // Another program of this machine may end TLS, and hand requests on without it:
  // the browser is at the https address all the same.
  request.isSecure = request.isSecure || settings.isHttps();
  const std::unique_ptr<Directory> directory = directoryOf(settings);
  if (!directory) {
    trustWebServer(request);
    return;
  }
  request.user.clear();
  const std::optional<std::string> cookie = cookieValue(request, kSessionCookie);
  if (!cookie || cookie->empty()) return;
  std::optional<Session> session = sessionsOf(settings, *directory).read(*cookie);
  if (!session) return;
  request.user = std::move(session->user);
  request.authTime = session->authTime;
  request.session = std::move(session->id);
}

}  // namespace keldoauth::service
