#include "service/people/address.h"

#include <gtest/gtest.h>

namespace {

using keldoauth::service::loggedAddress;
using keldoauth::service::neighbourhood;

struct Case {
  const char* peer;
  const char* neighbourhood;
  const char* logged;
};

constexpr Case kCases[] = {
    {"192.0.2.1", "192.0.2.1", "192.0.2.1"},
    {"::ffff:192.0.2.1", "192.0.2.1", "192.0.2.1"},
    {"2001:db8:1:2:3:4:5:6", "2001:db8:1:2::/64", "2001:db8:1:2:3:4:5:6"},
    {"2001:DB8:1:2::9", "2001:db8:1:2::/64", "2001:db8:1:2::9"},
    {"2001:db8:1:3::9", "2001:db8:1:3::/64", "2001:db8:1:3::9"},
    {"::1", "::/64", "::1"},
    {"", "unknown", "unknown"},
    {"unix:", "unknown", "unknown"},
    {"192.0.2.1\n", "unknown", "unknown"},
    {"192.0.2.1 from 198.51.100.7", "unknown", "unknown"},
    {"fe80::1%eth0", "unknown", "unknown"},
};

TEST(AddressTest, AnAddressStandsForItsHousehold) {
  for (const Case& each : kCases) EXPECT_EQ(neighbourhood(each.peer), each.neighbourhood);
}

TEST(AddressTest, TheLogHasOneSpellingAndNothingElse) {
  for (const Case& each : kCases) EXPECT_EQ(loggedAddress(each.peer), each.logged);
}

}  // namespace
