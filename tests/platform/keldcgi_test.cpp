#include "platform/keldcgi.h"

#include <cstdlib>

#include "tests/platform/platform_test.h"

namespace {

class CgiAddressTest : public support::World {
 protected:
  void SetUp() override {
    World::SetUp();
    setAddress("192.0.2.7");
  }
  void TearDown() override {
    ::unsetenv("REMOTE_ADDR");
    World::TearDown();
  }

  static void setAddress(const std::string& text) {
    ASSERT_EQ(::setenv("REMOTE_ADDR", text.c_str(), 1), 0);
  }

  /// Nothing when the call returned non-zero. A byte behind the buffer is
  /// watched.
  static Text address(std::size_t size = 1024) {
    std::vector<char> buffer(size + 1, '#');
    const int result = getRemoteIp(buffer.data(), size);
    EXPECT_EQ(buffer[size], '#') << size;
    if (result != 0) return std::nullopt;
    return std::string(buffer.data());
  }

  static int getRemoteIp(char* buffer, std::size_t size) {
    return standIn<decltype(KeldCgiGetRemoteIP)>("KeldCgiGetRemoteIP")(buffer, size);
  }
};

TEST_F(CgiAddressTest, IsWhatTheWebServerPutsIntoTheEnvironment) {
  for (const char* text : {"192.0.2.7", "2001:db8::1", "fe80::1%eth0", "::ffff:192.0.2.7"}) {
    setAddress(text);
    EXPECT_EQ(address(), text);
  }
}

TEST_F(CgiAddressTest, IsNotJudged) {
  setAddress("no address, it's '%s'");
  EXPECT_EQ(address(), "no address, it's '%s'");
}

TEST_F(CgiAddressTest, IsReadAfreshEachTime) {
  EXPECT_EQ(address(), "192.0.2.7");
  setAddress("198.51.100.23");
  EXPECT_EQ(address(), "198.51.100.23");
}

TEST_F(CgiAddressTest, AbsentAddressIsRefused) {
  ::unsetenv("REMOTE_ADDR");
  EXPECT_EQ(address(), std::nullopt);
}

TEST_F(CgiAddressTest, EmptyAddressIsRefused) {
  setAddress("");
  EXPECT_EQ(address(), std::nullopt);
}

TEST_F(CgiAddressTest, FitsExactlyWithItsTerminator) {
  EXPECT_EQ(address(10), "192.0.2.7");
}

TEST_F(CgiAddressTest, AnySmallerBufferIsRefused) {
  for (std::size_t size = 0; size < 10; ++size) EXPECT_EQ(address(size), std::nullopt) << size;
}

TEST_F(CgiAddressTest, LongestTextOfTheLibrarysBufferHas1023Bytes) {
  setAddress(std::string(1023, '1'));
  EXPECT_EQ(address(1024), std::string(1023, '1'));
  setAddress(std::string(1024, '1'));
  EXPECT_EQ(address(1024), std::nullopt);
}

TEST_F(CgiAddressTest, NullBufferIsRefused) {
  EXPECT_NE(getRemoteIp(nullptr, 1024), 0);
  EXPECT_NE(getRemoteIp(nullptr, 0), 0);
}

TEST_F(CgiAddressTest, SuccessIsZero) {
  char buffer[1024];
  EXPECT_EQ(getRemoteIp(buffer, sizeof buffer), 0);
}

TEST_F(CgiAddressTest, NothingIsLogged) {
  address();
  address(3);
  getRemoteIp(nullptr, 0);
  EXPECT_THAT(support::SystemLog::lines(), ::testing::IsEmpty());
}

}  // namespace
