#include "service/signing/base64url.h"
#include "service/text/encoding.h"

#include <gtest/gtest.h>

#include <string>

#include "tests/signing/vectors.h"

namespace {

using keldoauth::service::base64Url;
using keldoauth::service::signing::fromBase64Url;
using keldoauth::service::signing::halfDigest;

struct Spelling {
  std::string bytes;
  std::string text;
};

// RFC 4648 10, without padding, and the two letters of the alphabet for names.
const Spelling kSpellings[] = {{"", ""},
                               {"f", "Zg"},
                               {"fo", "Zm8"},
                               {"foo", "Zm9v"},
                               {"foob", "Zm9vYg"},
                               {"fooba", "Zm9vYmE"},
                               {"foobar", "Zm9vYmFy"},
                               {"\xfb\xff", "-_8"},
                               {std::string("\0", 1), "AA"}};

TEST(Base64UrlTest, WritesWithoutPadding) {
  for (const auto& [bytes, text] : kSpellings) EXPECT_EQ(base64Url(bytes), text);
}

TEST(Base64UrlTest, ReadsWhatItWrites) {
  for (const auto& [bytes, text] : kSpellings) EXPECT_EQ(fromBase64Url(text), bytes) << text;
}

TEST(Base64UrlTest, RefusesEverySpellingButOne) {
  for (const char* text : {"Zg==", "Zm8=", "Zh", "Zm9", "Z", "Zm9vY", "Zm 9v", "Zm9v\n", " Zm9v",
                           "+/8", "Zm9v=", "Zm9v.", "=", "Z\xc3\xa4"}) {
    EXPECT_EQ(fromBase64Url(text), std::nullopt) << text;
  }
  EXPECT_EQ(fromBase64Url(std::string("Zm9v\0", 5)), std::nullopt);
}

TEST(HalfDigestTest, IsTheAtHashOfAnAccessToken) {
  EXPECT_EQ(halfDigest(vectors::kAccessToken), vectors::kAtHash);
}

}  // namespace
