// The lengths that are accepted, to say which value a refusal is about: what
// refuses says no more than that one is.

#ifndef KELDOAUTH_TOOLS_BOUNDS_H
#define KELDOAUTH_TOOLS_BOUNDS_H

#include <initializer_list>
#include <string>

#include "utils/oauth_bounds.h"

namespace tool {

/// "64 bytes", "1 to 2048 bytes", "at most 512 bytes".
std::string accepted(const KELDOAUTHSERVER::Bounds& bounds);

/// A value and what the user calls it.
struct Measured {
  const char* name;
  const std::string& value;
  KELDOAUTHSERVER::Bounds bounds;
};

/// "--scope: 1 to 2048 bytes, not 0" for the first value out of its bounds;
/// empty when there is none.
std::string outOfBounds(std::initializer_list<Measured> values);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_BOUNDS_H
