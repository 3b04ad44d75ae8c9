// Which endpoint answers which path.

#ifndef KELDOAUTH_SERVICE_PROGRAM_ROUTES_H
#define KELDOAUTH_SERVICE_PROGRAM_ROUTES_H

#include <string>
#include <string_view>

#include "service/context.h"

namespace keldoauth::service {

/// How a failure is told: to programs as JSON, to people as a page.
using Tell = Answer (*)(const Settings& settings, const Failure& failure);

Answer tellAsJson(const Settings& settings, const Failure& failure);

struct Route {
  std::string_view path;  // below the issuer's; what ends in a slash, and all below
  Endpoint endpoint;
  Tell tell;
  /// The methods that scripts of any origin may use; null: none.
  const char* openTo = nullptr;
  /// Whoever comes here shows a secret: wrong ones are counted.
  bool asksSecret = false;
};

/// Null for a path that nothing answers. `path` as the browser asked for it. What
/// is well known stands below the issuer's path, and before it as well (RFC 8414,
/// 3.1).
const Route* routeOf(const std::string& path, const std::string& basePath);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PROGRAM_ROUTES_H
