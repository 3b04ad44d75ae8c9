// Digests, and what stands in the file in place of a token.

#include "grants/rows/digest.h"

#include <gtest/gtest.h>

#include <set>

namespace {

using namespace KELDOAUTHSERVER::grants::rows;

constexpr char kSha256OfAbc[] = "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad";

TEST(DigestTest, IsSha256InHexadecimalDigits) {
  EXPECT_EQ(hexDigest("abc"), kSha256OfAbc);
}

TEST(DigestTest, AMarkFillsItsColumn) {
  EXPECT_EQ(markOf("abc"), "sha256:" + std::string(kSha256OfAbc).substr(0, 57));
  EXPECT_EQ(markOf("abc").size(), 64U);
}

TEST(DigestTest, AMarkIsKnownByItsStart) {
  EXPECT_TRUE(isMark(markOf("abc")));
  EXPECT_TRUE(isMark("sha256:"));
  EXPECT_FALSE(isMark("sha256"));
  EXPECT_FALSE(isMark("SHA256:abc"));
}

TEST(DigestTest, TheChallengeIsThatOfTheStandard) {
  EXPECT_EQ(challengeOf("dBjftJeZ4CVP-mB92K27uhbUJU1p1r_wW1gFWFOEjXk"),
            "E9Melhoa2OwvFrEMTJguCHaoeK1t8URWbuGJSstw-cM");
}

TEST(DigestTest, SecretsAreEqualOnlyWhenTheyAre) {
  EXPECT_TRUE(equalSecrets("abc", "abc"));
  EXPECT_TRUE(equalSecrets("", ""));
  EXPECT_FALSE(equalSecrets("abc", "abd"));
  EXPECT_FALSE(equalSecrets("abc", "ab"));
}

TEST(DigestTest, RandomDigitsHaveTheLengthThatWasAskedFor) {
  for (const std::size_t length : {1U, 40U, 57U, 64U}) {
    EXPECT_EQ(randomDigits(length).size(), length);
  }
}

TEST(DigestTest, RandomDigitsDoNotRepeat) {
  std::set<std::string> drawn;
  for (int i = 0; i < 1000; ++i) drawn.insert(randomDigits(40));
  EXPECT_EQ(drawn.size(), 1000U);
}

}  // namespace
