// The verdict of a fuzz target.

#ifndef KELDOAUTH_TESTS_FUZZ_EXPECT_H
#define KELDOAUTH_TESTS_FUZZ_EXPECT_H

#include <string_view>

namespace fuzz {

/// Ends the program, with a word about what was not so, unless `condition`.
void expect(bool condition, const char* what, std::string_view detail = "");

}  // namespace fuzz

#endif  // KELDOAUTH_TESTS_FUZZ_EXPECT_H
