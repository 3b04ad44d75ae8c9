// Whether the platform's key on this box is the one that the store's identifiers
// and secrets are encrypted with. The store keeps one text that was encrypted
// with it; the cipher always makes the same of the same.

#ifndef KELDOAUTH_ENGINES_POSTGRESQL_KEY_H
#define KELDOAUTH_ENGINES_POSTGRESQL_KEY_H

#include <string>

namespace keldoauth::postgresql {

inline constexpr char kKeyIsAnother[] =
    "the platform's key on this box is not the store's: bring the store's key";
inline constexpr char kKeyFails[] =
    "the platform's cipher does not work on this box: is its key missing?";

/// What the store's text must be for this box. Empty when the cipher fails.
std::string sealOfThisBox();

}  // namespace keldoauth::postgresql

#endif  // KELDOAUTH_ENGINES_POSTGRESQL_KEY_H
