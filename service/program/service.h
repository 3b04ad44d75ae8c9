// From a request to its answer, whatever happens on the way.

#ifndef KELDOAUTH_SERVICE_PROGRAM_SERVICE_H
#define KELDOAUTH_SERVICE_PROGRAM_SERVICE_H

#include <optional>
#include <string>

#include "service/context.h"
#include "service/program/routes.h"

namespace keldoauth::service {

class Service {
 public:
  /// The settings are read with the first request.
  explicit Service(std::string settingsPath);

  /// What the endpoint returns or throws; 404 where there is none; and when the
  /// store could not do it, in the form that the route has for failures: 503,
  /// with Retry-After when the same request can succeed in a moment, or 500.
  /// Throws nothing but what memory that has run out makes of telling so.
  Answer answer(const Request& request);

 private:
  Answer answerBy(const Route& route, const Request& request);

  std::string settingsPath_;
  std::optional<Settings> settings_;
  KeptStore store_;
};

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PROGRAM_SERVICE_H
