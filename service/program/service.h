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

  /// 404 where there is no endpoint, and 403 for what comes neither by TLS nor
  /// from this machine; else as below. Throws nothing but what memory that has run
  /// out makes of telling so.
  Answer answer(const Request& request);

 private:
  KeptSettings settings_;
  KeptStore store_;
};

/// What the endpoint returns or throws; and when the store could not do it, in the
/// form that the route has for failures: 503, with Retry-After when the same
/// request can succeed in a moment, or 500. The store is closed then, and opened
/// anew by the next request.
///
/// When the store's file was replaced meanwhile the request is done once more, on
/// the new one: what it did to the old one is gone, and nobody has been told.
Answer answerBy(const Route& route, const Settings& settings, KeptStore& store,
                const Request& request);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PROGRAM_SERVICE_H
