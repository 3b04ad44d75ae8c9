#include <algorithm>
#include <cstdlib>

#include "tests/support/allocations.h"
#include "tests/support/world.h"
#include "utils/oauth_utils.h"

namespace {

using namespace KELDOAUTHSERVER;
using support::Platform;
using support::SystemLog;
using ::testing::IsEmpty;

class RemoteIpTest : public support::World {};

TEST_F(RemoteIpTest, IsTheTextOfThePlatform) {
  for (const char* text : {"192.0.2.7", "2001:db8::1", "fe80::1%eth0", "::ffff:192.0.2.7", ""}) {
    Platform::answerRemoteIp(text);
    EXPECT_EQ(getRemoteIP(), text);
  }
}

TEST_F(RemoteIpTest, IsNotValidated) {
  Platform::answerRemoteIp("no address, it's '%s'");
  EXPECT_EQ(getRemoteIP(), "no address, it's '%s'");
}

TEST_F(RemoteIpTest, IsEmptyWhenThePlatformRefuses) {
  for (const int result : {1, -1, 2, 255, -2147483647}) {
    Platform::answerRemoteIp("192.0.2.7", result);
    EXPECT_EQ(getRemoteIP(), "") << result;
  }
}

TEST_F(RemoteIpTest, PlatformGetsAZeroedBufferOf1024Bytes) {
  std::size_t size = 0;
  bool zeroed = false;
  Platform::useAddress([&](char* buffer, std::size_t bytes) {
    size = bytes;
    zeroed = std::all_of(buffer, buffer + bytes, [](char c) { return c == '\0'; });
    return 0;
  });
  EXPECT_EQ(getRemoteIP(), "");
  EXPECT_EQ(size, 1024U);
  EXPECT_TRUE(zeroed);
}

TEST_F(RemoteIpTest, LongestTextFillsTheBuffer) {
  Platform::answerRemoteIp(std::string(1023, '1'));
  EXPECT_EQ(getRemoteIP(), std::string(1023, '1'));
}

TEST_F(RemoteIpTest, TextWithoutTerminatorEndsWithTheBuffer) {
  Platform::useAddress([](char* buffer, std::size_t size) {
    std::fill_n(buffer, size, '1');
    return 0;
  });
  EXPECT_EQ(getRemoteIP(), std::string(1024, '1'));
}

TEST_F(RemoteIpTest, IsEmptyOutsideARequest) {
  EXPECT_EQ(getRemoteIP(), "");
}

TEST_F(RemoteIpTest, IsTheAddressOfTheRequest) {
  ASSERT_EQ(setenv("REMOTE_ADDR", "198.51.100.23", 1), 0);
  EXPECT_EQ(getRemoteIP(), "198.51.100.23");
}

TEST_F(RemoteIpTest, IsAskedForAfreshEachTime) {
  Platform::answerRemoteIp("192.0.2.1");
  EXPECT_EQ(getRemoteIP(), "192.0.2.1");
  Platform::answerRemoteIp("192.0.2.2");
  EXPECT_EQ(getRemoteIP(), "192.0.2.2");
}

TEST_F(RemoteIpTest, IsEmptyWhenMemoryRunsOut) {
  Platform::answerRemoteIp(std::string(200, '1'));
  std::string address = "untouched";
  {
    const support::FailingAllocation failing(1);
    address = getRemoteIP();
  }
  ASSERT_TRUE(support::FailingAllocation::happened());
  EXPECT_EQ(address, "");
}

TEST_F(RemoteIpTest, NothingIsLogged) {
  withDiagnostics(-1, [] {
    getRemoteIP();
    Platform::answerRemoteIp("192.0.2.7", 1);
    getRemoteIP();
  });
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

}  // namespace
