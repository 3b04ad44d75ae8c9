// Entries of the audit log for what happens to the store as a whole. Everything
// else is recorded by the operations themselves.

#ifndef KELDOAUTH_TOOLS_AUDIT_H
#define KELDOAUTH_TOOLS_AUDIT_H

#include <string>

#include "grants/texts.h"

namespace tool {

/// The administrator who runs this.
KELDOAUTHSERVER::grants::Actor actor();

/// Records what `command` has just done. False, with a note on standard error,
/// when there is no entry: what was done stays done.
bool isRecorded(const std::string& command, const std::string& what);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_AUDIT_H
