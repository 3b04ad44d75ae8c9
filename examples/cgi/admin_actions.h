// What the forms of the administrator's page do.

#ifndef KELDOAUTH_EXAMPLES_CGI_ADMIN_ACTIONS_H
#define KELDOAUTH_EXAMPLES_CGI_ADMIN_ACTIONS_H

#include "examples/cgi/answer.h"
#include "grants/grants.h"

namespace service {

/// The form's token has been checked.
Answer act(KELDOAUTHSERVER::grants::Grants& store, const Request& request, const Parameters& form);

}  // namespace service

#endif  // KELDOAUTH_EXAMPLES_CGI_ADMIN_ACTIONS_H
