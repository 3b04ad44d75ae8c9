// What the library and the floor above it could not do, as the failure of a
// command.

#ifndef KELDOAUTH_TOOLS_TROUBLE_H
#define KELDOAUTH_TOOLS_TROUBLE_H

#include <string>

#include "core/oauth_db_basic.h"
#include "grants/trouble.h"
#include "tools/keldoauth/console/failure.h"

namespace tool {

Failure failureOf(const KELDOAUTHSERVER::grants::Trouble& trouble);

/// What `store` says about the operation that just failed. When it refused the
/// values, `explanation` (may be empty) says which of them is at fault.
Failure libraryFailure(KELDOAUTHSERVER::OAUTHDBBasic& store, const std::string& explanation = {});

/// The same for a code and message of the library's or SQLite's.
Failure libraryFailure(int code, const std::string& message, const std::string& explanation = {});

/// Throws when the constructor of `store` could not make it ready.
void requireReady(KELDOAUTHSERVER::OAUTHDBBasic& store);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_TROUBLE_H
