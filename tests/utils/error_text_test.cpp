#include "utils/error_text.h"

#include <gtest/gtest.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <string_view>

namespace {

using KELDOAUTHSERVER::errorText;

/// glibc's form and the standard's.
char* gnuForm(int /*error*/, char* /*buffer*/, std::size_t /*size*/) {
  static char text[] = "from a table";
  return text;
}
int standardForm(int error, char* buffer, std::size_t size) {
  if (error < 0) return EINVAL;
  constexpr std::string_view kText = "Operation not permitted";
  buffer[kText.copy(buffer, size - 1)] = '\0';
  return size > kText.size() ? 0 : ERANGE;
}

TEST(ErrorTextTest, TextOfTheGnuFormIsWhatItReturns) {
  std::array<char, 64> buffer{};
  EXPECT_STREQ(errorText(gnuForm(EPERM, buffer.data(), buffer.size()), buffer.data()),
               "from a table");
}

TEST(ErrorTextTest, TextOfTheStandardFormIsInTheBuffer) {
  std::array<char, 64> buffer{};
  EXPECT_STREQ(errorText(standardForm(EPERM, buffer.data(), buffer.size()), buffer.data()),
               "Operation not permitted");
}

TEST(ErrorTextTest, TextThatDoesNotFitIsCut) {
  std::array<char, 10> buffer{};
  EXPECT_STREQ(errorText(standardForm(EPERM, buffer.data(), buffer.size()), buffer.data()),
               "Operation");
}

TEST(ErrorTextTest, NumberWithoutATextHasOneAllTheSame) {
  std::array<char, 64> buffer{};
  EXPECT_STREQ(errorText(standardForm(-1, buffer.data(), buffer.size()), buffer.data()),
               "Unknown error");
}

TEST(ErrorTextTest, TextOfThisSystemsFormIsTheSystemsOwn) {
  std::array<char, 1024> buffer{};
  EXPECT_STREQ(errorText(strerror_r(EPERM, buffer.data(), buffer.size()), buffer.data()),
               std::strerror(EPERM));
}

}  // namespace
