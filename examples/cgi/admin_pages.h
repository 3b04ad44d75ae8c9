// The views of the administrator's page.

#ifndef KELDOAUTH_EXAMPLES_CGI_ADMIN_PAGES_H
#define KELDOAUTH_EXAMPLES_CGI_ADMIN_PAGES_H

#include <string>

#include "examples/cgi/answer.h"

namespace service {

/// The fields of the registration form, to be shown again with its fault.
struct Draft {
  std::string name;
  std::string redirect;
  std::string scope = "profile";
  std::string fault;
};

/// `done` is the word for what was done just now; unknown words say nothing.
Answer applicationsPage(const std::string& user, const std::string& done, const Draft& draft);

/// `shown` is whose access is shown; empty for the list of users.
Answer accessPage(const std::string& user, const std::string& done, const std::string& shown);

/// The page with this `number`: 1 is the newest; any text will do.
Answer logPage(const std::string& user, const std::string& filter, const std::string& number);
Answer storagePage(const std::string& user);

/// The only time that a secret is shown.
Answer secretPage(const std::string& user, const std::string& name, const std::string& identifier,
                  const std::string& secret);

}  // namespace service

#endif  // KELDOAUTH_EXAMPLES_CGI_ADMIN_PAGES_H
