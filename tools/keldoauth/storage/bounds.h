// The lengths that the stores accept, to say which value a refusal is about:
// the library itself only says "Bad parameters".

#ifndef KELDOAUTH_TOOLS_BOUNDS_H
#define KELDOAUTH_TOOLS_BOUNDS_H

#include <cstddef>
#include <initializer_list>
#include <string>

namespace tool {

struct Bounds {
  std::size_t min;
  std::size_t max;
};

namespace bounds {
inline constexpr Bounds kIdentifier{64, 64};
inline constexpr Bounds kRedirectUri{3, 2048};
inline constexpr Bounds kScope{1, 2048};
inline constexpr Bounds kDisplayName{1, 64};
inline constexpr Bounds kUsername{1, 256};
inline constexpr Bounds kState{1, 2048};
inline constexpr Bounds kFlowType{1, 32};
}  // namespace bounds

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
