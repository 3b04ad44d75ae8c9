// What the values of a request must be.

#include "grants/rows/checks.h"

#include <gtest/gtest.h>

#include <string>

namespace {

using namespace KELDOAUTHSERVER::grants::rows;
using KELDOAUTHSERVER::grants::Why;
namespace bounds = KELDOAUTHSERVER::bounds;

TEST(ChecksTest, PeersAreAddressesOrEmpty) {
  for (const char* text :
       {"", "192.0.2.1", "::1", "2001:db8::1", "fe80::1%eth0", "fe80::1%3", "fe80::1%"}) {
    EXPECT_TRUE(isPeer(text)) << text;
  }
  for (const char* text :
       {"999.1.1.1", "localhost", "192.0.2.1%eth0", "::1%a'b", "192.0.2.1 ", "%eth0"}) {
    EXPECT_FALSE(isPeer(text)) << text;
  }
  EXPECT_FALSE(isPeer(std::string("192.0.2.1\0", 10)));
  EXPECT_FALSE(isPeer(std::string("::1%a\0", 6)));
}

TEST(ChecksTest, AddressesAreAbsoluteAndPrintable) {
  for (const char* text : {"https://a.example/", "http://127.0.0.1:1/", "com.example.app:/x", "a:b",
                           "https://a.example/?it's=1#x"}) {
    EXPECT_TRUE(isAddress(text)) << text;
  }
  for (const char* text : {"", "a", ":", "a:", "/x", "a.example/x", "1a:/x", "(none)",
                           "https://a b", "https://\x7f", "https://\xc3\xa4", "https://<x>"}) {
    EXPECT_FALSE(isAddress(text)) << text;
  }
}

TEST(ChecksTest, ASchemeBeginsWithALetterOfAscii) {
  for (const char* text : {"a:x", "z:x", "A:x", "Z:x", "m0:x", "m9:x"}) {
    EXPECT_TRUE(isAddress(text)) << text;
  }
  for (const char* text : {"`:x", "{:x", "@:x", "[:x", "0:x", "9:x", "m/:x", "m;:x"}) {
    EXPECT_FALSE(isAddress(text)) << text;
  }
}

TEST(ChecksTest, IdentifiersHave64Characters) {
  EXPECT_TRUE(isIdentifier(std::string(64, 'a')));
  EXPECT_TRUE(isIdentifier(std::string(60, 'Z') + "-._~"));
  EXPECT_FALSE(isIdentifier(std::string(63, 'a')));
  EXPECT_FALSE(isIdentifier(std::string(65, 'a')));
  EXPECT_FALSE(isIdentifier(std::string(63, 'a') + " "));
  EXPECT_FALSE(isIdentifier(std::string(63, 'a') + "'"));
}

TEST(ChecksTest, AScopeIsWithinAnotherByItsNames) {
  EXPECT_TRUE(isScopeWithin("a", "a b"));
  EXPECT_TRUE(isScopeWithin(" b  a b", "a b"));
  EXPECT_FALSE(isScopeWithin("c", "a b"));
  EXPECT_FALSE(isScopeWithin("ab", "a b"));
  EXPECT_FALSE(isScopeWithin("A", "a b"));
  EXPECT_FALSE(isScopeWithin("", "a b"));
  EXPECT_FALSE(isScopeWithin(" ", "a b"));
}

TEST(ChecksTest, TheFirstFaultIsNamed) {
  const std::string empty;
  const std::string nul("a\0b", 3);
  const std::string good = "a";
  EXPECT_EQ(faultOf({{good, bounds::kScope}, {empty, bounds::kScope}}), Why::kOutOfBounds);
  EXPECT_EQ(faultOf({{nul, bounds::kScope}, {empty, bounds::kScope}}), Why::kHasNul);
  EXPECT_FALSE(faultOf({{good, bounds::kScope}}));
}

TEST(ChecksTest, ALifetimeIsASecondToAHundredYears) {
  EXPECT_TRUE(isLifetime({}));
  EXPECT_TRUE(isLifetime(1));
  EXPECT_TRUE(isLifetime(100LL * 365 * 86400));
  EXPECT_FALSE(isLifetime(0));
  EXPECT_FALSE(isLifetime(-1));
  EXPECT_FALSE(isLifetime(100LL * 365 * 86400 + 1));
}

}  // namespace
