// The gate before every trace line. Lines that are always written call syslog
// themselves; the form of both is "%s:%d " (source file without its extension,
// line number) followed by the message, as one literal, so that the compiler
// checks it and whoever watches syslog sees format and arguments apart.

#ifndef KELDOAUTH_UTILS_DIAGNOSTICS_H
#define KELDOAUTH_UTILS_DIAGNOSTICS_H

#include <syslog.h>

#include "utils/oauth_utils.h"

namespace KELDOAUTHSERVER {

/// The classes of trace lines: bits of the setting names::kLogLevel.
enum LogMask : int {
  kStoreTrace = 1,   // store operations and success messages
  kRowDump = 2,      // every column of every row read
  kLengthCheck = 4,  // the argument of each length check
  kCoreTrace = 8,    // storage core, with the SQL text
};

/// The flag file is asked first: without it the settings are never opened.
inline bool isTraced(LogMask mask) {
  return isDebugEnabled() && (getLogLevel() & mask) != 0;
}

/// The line that an operation writes on entry.
inline void traceEntry(LogMask mask, const char* source, int line, const char* operation) {
  if (isTraced(mask)) {
    syslog(LOG_ERR, "%s:%d ==> %s", source, line, operation);
  }
}

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_UTILS_DIAGNOSTICS_H
