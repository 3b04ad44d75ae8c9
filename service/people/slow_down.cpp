#include "service/people/slow_down.h"

#include <string>

#include "service/people/address.h"
#include "service/people/auth_log.h"
#include "service/people/people.h"

namespace keldoauth::service {
namespace {

Answer tooMany(int seconds) {
  return oauthError(429, "slow_down", "Too many requests of this kind from this address")
      .with("Retry-After", std::to_string(seconds));
}

}  // namespace

Answer afterSecret(const Settings& settings, const Request& request, Answer answer) {
  // Without a header or a form nobody has tried a secret.
  if (answer.status != 401 || (request.authorization.empty() && request.body.empty())) {
    return answer;
  }
  const int wait =
      throttleOf(settings).take(Deed::kWrongSecretFromAddress, neighbourhood(request.peer));
  if (wait == 0) {
    logFailedSecret(request.peer, request.path);
    return answer;
  }
  logThrottled("secret", request.peer);
  return tooMany(wait);
}

void countRegistration(const Settings& settings, const Request& request) {
  const int wait =
      throttleOf(settings).take(Deed::kRegistrationFromAddress, neighbourhood(request.peer));
  if (wait == 0) return;
  logThrottled("registration", request.peer);
  throw Refusal{tooMany(wait)};
}

}  // namespace keldoauth::service
