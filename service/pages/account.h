// /account: what a user of the box has allowed, and taking it back.

#ifndef KELDOAUTH_SERVICE_PAGES_ACCOUNT_H
#define KELDOAUTH_SERVICE_PAGES_ACCOUNT_H

#include "service/context.h"

namespace keldoauth::service {

/// For everybody who is signed in, about themselves alone. A form's token covers
/// the user and what the form takes back.
Answer account(Context& context, const Request& request);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PAGES_ACCOUNT_H
