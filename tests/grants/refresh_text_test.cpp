// The form of a refresh token.

#include "grants/rows/refresh_text.h"

#include <gtest/gtest.h>

#include <limits>
#include <string>

namespace {

using namespace KELDOAUTHSERVER::grants::rows;

TEST(RefreshTextTest, NamesItsRowItsFamilyAndItsSecret) {
  const RefreshText token = firstOf(42);
  const auto found = read(write(token));
  ASSERT_TRUE(found);
  EXPECT_EQ(found->row, 42);
  EXPECT_EQ(found->family, token.family);
  EXPECT_EQ(found->secret, token.secret);
}

TEST(RefreshTextTest, EveryRowCanBeNamed) {
  for (const long long row : {0LL, 1LL, 4294967296LL, std::numeric_limits<long long>::max()}) {
    const auto found = read(write(firstOf(row)));
    ASSERT_TRUE(found);
    EXPECT_EQ(found->row, row);
  }
}

TEST(RefreshTextTest, FamilyAndSecretHave160DigitsOfAHex) {
  EXPECT_EQ(firstOf(1).family.size() * 4, 160U);
  EXPECT_EQ(firstOf(1).secret.size() * 4, 160U);
}

TEST(RefreshTextTest, TheNextOneHasTheFamilyAndAnotherSecret) {
  const RefreshText first = firstOf(7);
  const RefreshText next = nextOf(first);
  EXPECT_EQ(next.row, 7);
  EXPECT_EQ(next.family, first.family);
  EXPECT_NE(next.secret, first.secret);
}

TEST(RefreshTextTest, OneDigitThatIsWrongIsNoticed) {
  const std::string text = write(firstOf(42));
  for (std::size_t i = 0; i < text.size(); ++i) {
    std::string wrong = text;
    wrong[i] = wrong[i] == '0' ? '1' : '0';
    EXPECT_FALSE(read(wrong)) << i;
  }
}

TEST(RefreshTextTest, ATextOfAnotherLengthIsRefused) {
  const std::string text = write(firstOf(42));
  for (std::size_t i = 0; i < text.size(); ++i) EXPECT_FALSE(read(text.substr(0, i)));
  EXPECT_FALSE(read(text + "0"));
  EXPECT_FALSE(read(text + std::string(1, '\0')));
}

TEST(RefreshTextTest, DigitsInUpperCaseAreRefused) {
  std::string text = write(firstOf(42));
  for (char& c : text) c = static_cast<char>(c >= 'a' ? c - 'a' + 'A' : c);
  EXPECT_FALSE(read(text));
}

TEST(RefreshTextTest, ANegativeRowIsRefused) {
  EXPECT_FALSE(read(write(firstOf(-1))));
}

}  // namespace
