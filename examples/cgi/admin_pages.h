// The views of the administrator's page.

#ifndef KELDOAUTH_EXAMPLES_CGI_ADMIN_PAGES_H
#define KELDOAUTH_EXAMPLES_CGI_ADMIN_PAGES_H

#include <string>

#include "examples/cgi/answer.h"
#include "grants/grants.h"

namespace service {

namespace grants = KELDOAUTHSERVER::grants;

/// The fields of the registration form, to be shown again with its fault.
struct Draft {
  std::string name;
  std::string redirect;
  std::string scope = "profile";
  std::string fault;
};

/// Whose access is shown: a user's, or an application's own; empty for the list.
struct Shown {
  std::string user;
  std::string application;
};

// `admin` is who looks; `done` is the word for what was done just now, and an
// unknown word says nothing.

Answer applicationsPage(const grants::Grants& store, const std::string& admin,
                        const std::string& done, const Draft& draft);
Answer accessPage(const grants::Grants& store, const std::string& admin, const std::string& done,
                  const Shown& shown);

/// The page with this `number`: 1 is the newest; any text will do.
Answer logPage(const grants::Grants& store, const std::string& admin, const std::string& filter,
               const std::string& number);
Answer storagePage(const grants::Grants& store, const std::string& admin);

/// The only time that a secret is shown.
Answer secretPage(const std::string& admin, const grants::ApplicationName& name,
                  const grants::Registered& registered);

}  // namespace service

#endif  // KELDOAUTH_EXAMPLES_CGI_ADMIN_PAGES_H
