// Experiments have a short form for every run of the tests and a long one.

#ifndef KELDOAUTH_TESTS_SUPPORT_LONG_FORM_H
#define KELDOAUTH_TESTS_SUPPORT_LONG_FORM_H

#include <cstdlib>
#include <string_view>

namespace support {

/// True when KELDOAUTH_LONG=1 stands in the environment.
inline bool isLongForm() {
  const char* wish = std::getenv("KELDOAUTH_LONG");
  return wish != nullptr && std::string_view(wish) == "1";
}

}  // namespace support

#endif  // KELDOAUTH_TESTS_SUPPORT_LONG_FORM_H
