#include "tests/fuzz/expect.h"

#include <cstdio>
#include <cstdlib>

namespace fuzz {

void expect(bool condition, const char* what, std::string_view detail) {
  if (condition) return;
  std::fprintf(stderr, "not as it should be: %s\n%.*s\n", what, static_cast<int>(detail.size()),
               detail.data());
  std::abort();
}

}  // namespace fuzz
