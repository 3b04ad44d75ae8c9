// Which value is out of the lengths that the stores accept: the library itself
// only says "Bad parameters".

#ifndef KELDOAUTH_TOOLS_BOUNDS_H
#define KELDOAUTH_TOOLS_BOUNDS_H

#include <initializer_list>
#include <string>

#include "utils/oauth_bounds.h"

namespace tool {

using KELDOAUTHSERVER::Bounds;
namespace bounds = KELDOAUTHSERVER::bounds;

/// A value and what the user calls it.
struct Measured {
  const char* name;
  const std::string& value;
  Bounds bounds;
};

/// "--scope: 1 to 2048 bytes, not 0" for the first value out of its bounds;
/// empty when there is none.
std::string outOfBounds(std::initializer_list<Measured> values);

/// The same for values that also have an address, the only other thing that
/// the stores refuse: when the lengths are right, it is at fault.
std::string outOfBounds(std::initializer_list<Measured> values, const std::string& ip);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_BOUNDS_H
