// The views of the administrator's page.

#ifndef KELDOAUTH_SERVICE_PAGES_ADMIN_PAGES_H
#define KELDOAUTH_SERVICE_PAGES_ADMIN_PAGES_H

#include <string>

#include "service/context.h"

namespace keldoauth::service {

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

// `done` is the word for what was done just now; an unknown word says nothing.

Answer applicationsPage(Context& context, const Request& request, const std::string& done,
                        const Draft& draft);
Answer accessPage(Context& context, const Request& request, const std::string& done,
                  const Shown& shown);

/// The page with this `number`: 1 is the newest; any text will do.
Answer logPage(Context& context, const Request& request, const std::string& filter,
               const std::string& number);
Answer storagePage(Context& context, const Request& request);

/// The only time that a secret is shown.
Answer secretPage(const Context& context, const Request& request,
                  const grants::ApplicationName& name, const grants::Registered& registered);

/// /admin: applications, access, audit log and storage, for the administrators of
/// the box. The web server has authenticated the user.
Answer admin(Context& context, const Request& request);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PAGES_ADMIN_PAGES_H
