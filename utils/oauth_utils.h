// Settings, diagnostic switches, SQL text, argument checks, the caller's
// address and random identifiers. Free functions without state, but for two
// values that each thread looks up once.
//
// None of these functions throws, getRandomStr excepted.

#ifndef KELDOAUTH_UTILS_OAUTH_UTILS_H
#define KELDOAUTH_UTILS_OAUTH_UTILS_H

#include <string>

namespace KELDOAUTHSERVER {

// Settings ------------------------------------------------------------------
//
// Read afresh from names::kSettingsFile on every call, so that an edit takes
// effect at once. A file that cannot be read or parsed, one that is not a
// regular file or has more than 65536 bytes, a missing key and a value that is
// no 32-bit integer (600.0 is one, 600.5 and "600" are not) all give the
// default. Nothing is logged.

/// Lifetime in seconds under `key` (names::kGrantCodeExpired or
/// names::kTokenExpired). 600 when absent or below 1; no upper bound.
int getExpiredPeriod(const std::string& key);

/// Most rows that a table may hold under `key` (names::kClientInfoMax,
/// kGrantCodeMax, kTokenMax or kLogMax). 1000 when absent or below 1, and never
/// more than 10000.
int getTableRowMax(const std::string& key);

// Diagnostics ---------------------------------------------------------------

/// True when names::kDebugFlagFile can be read. Looked up at the first call in
/// each thread and kept for the life of the thread.
bool isDebugEnabled();

/// The bit mask names::kLogLevel of the settings, 0 when absent. Looked up at
/// the first call in each thread and kept for the life of the thread.
/// Note: -1 also marks "not looked up"; a file that says -1 switches every
/// class on and is read again at each call.
int getLogLevel();

// SQL text ------------------------------------------------------------------

/// `value` with every single quote doubled and no quotes around it. Reading
/// stops at the first NUL byte. Empty when memory runs out, with the line
/// "Can't transfer to SQL format" in the system log.
std::string getSQLFormatStr(const std::string& value);

/// The predicate "<column> like '%<value>%'" with the quotes in `value`
/// doubled; `%` and `_` in it keep their meaning as wildcards. `column` is
/// inserted as it stands: never outside input. Fails as getSQLFormatStr does.
std::string getSQLFormatLikeStr(const std::string& column, const std::string& value);

// Requests ------------------------------------------------------------------

/// True when `str` is between `min` and `max` bytes long, both included.
/// With `allowEmpty` an empty string passes whatever the bounds say.
/// Note: at log level 4 the string itself is logged, secrets included.
bool checkStrLen(const std::string& str, int min, int max, bool allowEmpty = false);

/// The remote address of the current web request as the platform reports it,
/// empty outside a request. The text is not validated here.
std::string getRemoteIP();

/// Unguessable lowercase hexadecimal text: whole pieces of 32 characters, as
/// many as reach `length`. A request for 33 gives 64, one for 0 gives none.
/// Each piece is one version-4 UUID without dashes from a generator of its own
/// that the system's random source has just seeded; nothing outlives a call.
/// Throws std::bad_alloc, or std::system_error when the source fails.
std::string getRandomStr(unsigned int length);

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_UTILS_OAUTH_UTILS_H
