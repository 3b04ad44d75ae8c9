// What the registry remembers beside addresses.

#include "grants/rows/registry_words.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace {

using namespace KELDOAUTHSERVER::grants::rows;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

TEST(RegistryWordsTest, EverythingComesBackAsItWas) {
  const std::string text = pack({{"https://a.example/", "app:/x"},
                                 {"https://a.example/(bye)"},
                                 true,
                                 true,
                                 {"(later)"},
                                 true});
  EXPECT_EQ(text,
            "https://a.example/ app:/x (pkce-optional) (self) (es256) "
            "(logout:https://a.example/(bye)) (later)");
  const RegistryWords words = unpackWords(text);
  EXPECT_THAT(words.addresses, ElementsAre("https://a.example/", "app:/x"));
  EXPECT_THAT(words.logoutAddresses, ElementsAre("https://a.example/(bye)"));
  EXPECT_TRUE(words.isPkceOptional);
  EXPECT_TRUE(words.registeredItself);
  EXPECT_THAT(words.others, ElementsAre("(later)"));
  EXPECT_TRUE(words.wantsEs256);
}

TEST(RegistryWordsTest, NoAddressIsAWordOfItsOwn) {
  EXPECT_EQ(pack({{}, {}, false, false, {}}), "(none)");
  EXPECT_THAT(unpackWords("(none)").addresses, IsEmpty());
}

TEST(RegistryWordsTest, AddressesWithoutASchemeAreRead) {
  const RegistryWords words = unpackWords("photos.example.org/callback localhost:1/");
  EXPECT_THAT(words.addresses, ElementsAre("photos.example.org/callback", "localhost:1/"));
  EXPECT_FALSE(words.isPkceOptional);
  EXPECT_FALSE(words.registeredItself);
}

TEST(RegistryWordsTest, BlanksInARowAreOne) {
  EXPECT_THAT(unpackWords("  a   b ").addresses, ElementsAre("a", "b"));
}

}  // namespace
