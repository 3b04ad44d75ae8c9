#include "service/people/names.h"

#include <gtest/gtest.h>

#include <string>

namespace {

using keldoauth::service::isPassword;
using keldoauth::service::isUserName;

TEST(NamesTest, OrdinaryAndForeignNamesAreNames) {
  for (const char* name : {"a", "alice", "o'neil", "DOMAIN\\alice", "alice@box", "al ice", "Zoë",
                           "\xF0\x9F\x90\x9F", "\xC2\xA0"}) {
    EXPECT_TRUE(isUserName(name)) << name;
  }
}

TEST(NamesTest, NamesHaveTheLengthsThatTheStoresAccept) {
  EXPECT_FALSE(isUserName(""));
  EXPECT_TRUE(isUserName(std::string(256, 'a')));
  EXPECT_FALSE(isUserName(std::string(257, 'a')));
}

TEST(NamesTest, ControlCharactersAreInNoName) {
  for (int c = 0; c < 0x20; ++c) {
    EXPECT_FALSE(isUserName(std::string("a") + static_cast<char>(c))) << c;
  }
  EXPECT_FALSE(isUserName("a\x7f"));
  EXPECT_FALSE(isUserName("a\xC2\x80"));
  EXPECT_FALSE(isUserName("a\xC2\x9F"));
}

TEST(NamesTest, WhatIsNoUtf8IsNoName) {
  for (const char* name : {"\xFF", "a\xC3", "\xC0\xAF", "\xED\xA0\x80"}) {
    EXPECT_FALSE(isUserName(name)) << name;
  }
}

TEST(NamesTest, APasswordIsAnyLineOfAnyBytes) {
  EXPECT_TRUE(isPassword("x"));
  EXPECT_TRUE(isPassword(" \t\x01\xFF: "));
  EXPECT_TRUE(isPassword(std::string(511, 'p')));
  EXPECT_FALSE(isPassword(std::string(512, 'p')));
  EXPECT_FALSE(isPassword(""));
}

TEST(NamesTest, WhatEndsALineIsInNoPassword) {
  EXPECT_FALSE(isPassword("a\nb"));
  EXPECT_FALSE(isPassword("a\r"));
  EXPECT_FALSE(isPassword(std::string("a\0b", 3)));
}

}  // namespace
