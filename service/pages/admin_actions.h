// What the forms of the administrator's page do.

#ifndef KELDOAUTH_SERVICE_PAGES_ADMIN_ACTIONS_H
#define KELDOAUTH_SERVICE_PAGES_ADMIN_ACTIONS_H

#include "service/context.h"

namespace keldoauth::service {

/// The form's token has been checked, and so has who sends it.
Answer act(Context& context, const Request& request, const Parameters& form);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PAGES_ADMIN_ACTIONS_H
