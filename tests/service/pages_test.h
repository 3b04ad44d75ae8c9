// The fixture of tests of the pages: what their forms hold, and whoever sends them.

#ifndef KELDOAUTH_TESTS_SERVICE_PAGES_TEST_H
#define KELDOAUTH_TESTS_SERVICE_PAGES_TEST_H

#include <string>
#include <vector>

#include "service/pages/account.h"
#include "service/pages/admin_pages.h"
#include "tests/service/login_test.h"

namespace service_test {

class PagesTest : public LoginTest {
 protected:
  Answer show(Endpoint endpoint, const std::string& user, const std::string& query = "");
  Answer send(Endpoint endpoint, const std::string& user, const Changes& fields);

  /// The form of an application's page that does this.
  Changes formOf(const grants::Registered& application, const std::string& action,
                 const Changes& changes = {});
  /// The form for a new application, filled in.
  Changes newForm(const Changes& changes = {});
  /// Follows a redirect to a page of the administrator.
  Answer follow(const Answer& answer, const std::string& user = "admin");
  std::string secretOn(const Answer& page);
  bool works(const Json::Value& login);
};

/// The hidden fields of each form that changes something.
std::vector<Changes> formsOf(const Answer& page);
bool has(const Answer& page, const std::string& text);

}  // namespace service_test

#endif  // KELDOAUTH_TESTS_SERVICE_PAGES_TEST_H
