// From a request to its answer, whatever happens on the way.

#ifndef KELDOAUTH_SERVICE_PROGRAM_SERVICE_H
#define KELDOAUTH_SERVICE_PROGRAM_SERVICE_H

#include <string>

#include "service/context.h"
#include "service/program/routes.h"
#include "service/settings/kept_settings.h"

namespace keldoauth::service {

class Service {
 public:
  explicit Service(std::string settingsPath);

  /// What the endpoint returns or throws; 404 where there is none; and when the
  /// store could not do it, in the form that the route has for failures: 503,
  /// with Retry-After when the same request can succeed in a moment, or 500.
  /// What comes neither by TLS nor from this machine is refused before that.
  /// Throws nothing but what memory that has run out makes of telling so.
  Answer answer(const Request& request);

 private:
  Answer answerBy(const Route& route, const Settings& settings, const Request& request);

  KeptSettings settings_;
  KeptStore store_;
};

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PROGRAM_SERVICE_H
