// The fixture of the service's tests: a store, settings, and requests that are
// handed to an endpoint without a web server.

#ifndef KELDOAUTH_TESTS_SERVICE_SERVICE_TEST_H
#define KELDOAUTH_TESTS_SERVICE_SERVICE_TEST_H

#include <json/value.h>

#include <string>

#include "service/context.h"
#include "tests/support/world.h"

namespace service_test {

using namespace keldoauth::service;

inline const std::string kInitialToken(48, 'i');
inline const std::string kCallback = "https://app.example/callback";

class ServiceTest : public support::World {
 protected:
  ServiceTest();

  /// What an endpoint returns, or the answer of the refusal that it throws.
  Answer call(Endpoint endpoint, const Request& request);
  /// An application that registered itself: identifier and secret.
  grants::Registered registered(const std::string& scope = "profile files.read");
  /// A login of alice with it.
  grants::Pair loggedIn(const grants::Registered& application);

  Settings settings;
  KeptStore store;
};

Request get(const std::string& path, const std::string& query = "");
Request post(const std::string& path, const std::string& form);
/// With an Authorization header of the Basic scheme.
Request by(const grants::Registered& application, Request request);
Request withBearer(const std::string& token, Request request);

Json::Value json(const Answer& answer);
/// "401 invalid_client".
std::string error(const Answer& answer);
/// Empty without such a header.
std::string header(const Answer& answer, const std::string& name);

}  // namespace service_test

#endif  // KELDOAUTH_TESTS_SERVICE_SERVICE_TEST_H
