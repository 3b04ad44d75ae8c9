#include "service/people/sessions.h"

#include "tests/service/people/scene.h"

namespace {

using keldoauth::service::DirectoryTrouble;
using keldoauth::service::KnownBrowsers;
using keldoauth::service::Session;
using keldoauth::service::Sessions;
using support::Clock;

constexpr long long kStart = 1700000000;
constexpr long long kHours = 12LL * 60 * 60;

class SessionsTest : public ::testing::Test {
 protected:
  void SetUp() override { Clock::setTo(kStart); }
  void TearDown() override { Clock::release(); }

  [[nodiscard]] std::string begin(const std::string& user = "alice") const {
    return sessions_.begin(user).value_or("");
  }

  std::string key_ = std::string(32, 'k');
  scene::TestDirectory directory_;
  Sessions sessions_{key_, directory_, kHours};

  SessionsTest() { directory_.people = {{"alice", {"", "one"}}, {"bob", {"", "two"}}}; }
};

TEST_F(SessionsTest, ASessionSaysWhoAndSinceWhen) {
  const auto session = sessions_.read(begin());
  ASSERT_TRUE(session);
  EXPECT_EQ(session->user, "alice");
  EXPECT_EQ(session->authTime, kStart);
  EXPECT_EQ(session->id.size(), 32U);
}

TEST_F(SessionsTest, AnyNameComesBack) {
  for (const std::string user : {"a:b", "a;b=c, d", "\"x\\", "Zo\xC3\xAB +%41", "\n"}) {
    directory_.people[user] = {"", "s"};
    const std::string cookie = begin(user);
    EXPECT_EQ(cookie.find_first_of(" ;,\"\\\n"), std::string::npos) << cookie;
    const auto session = sessions_.read(cookie);
    ASSERT_TRUE(session) << user;
    EXPECT_EQ(session->user, user);
  }
}

TEST_F(SessionsTest, TwoSessionsOfOneSecondDiffer) {
  EXPECT_NE(begin(), begin());
}

TEST_F(SessionsTest, ASessionEndsAndIsNotProlonged) {
  const std::string cookie = begin();
  Clock::setTo(kStart + kHours - 1);
  EXPECT_TRUE(sessions_.read(cookie));
  Clock::setTo(kStart + kHours);
  EXPECT_FALSE(sessions_.read(cookie));
}

TEST_F(SessionsTest, AShorterSettingHoldsForSessionsThatAreThere) {
  const std::string cookie = begin();
  Clock::setTo(kStart + 3600);
  EXPECT_FALSE(Sessions(key_, directory_, 3600).read(cookie));
}

TEST_F(SessionsTest, ASessionFromTheFutureIsNone) {
  const std::string cookie = begin();
  Clock::setTo(kStart - 60);
  EXPECT_TRUE(sessions_.read(cookie)) << "clocks are set right by seconds";
  Clock::setTo(kStart - 61);
  EXPECT_FALSE(sessions_.read(cookie));
}

TEST_F(SessionsTest, EveryCharacterIsVouchedFor) {
  const std::string cookie = begin();
  for (std::size_t i = 0; i < cookie.size(); ++i) {
    for (const char c : {'A', '0', ':', '%', '~'}) {
      std::string forged = cookie;
      forged[i] = c;
      if (forged == cookie) continue;
      EXPECT_FALSE(sessions_.read(forged)) << forged;
    }
    EXPECT_FALSE(sessions_.read(cookie.substr(0, i))) << i;
    EXPECT_FALSE(sessions_.read(cookie.substr(0, i) + "x" + cookie.substr(i))) << i;
  }
  EXPECT_FALSE(sessions_.read(cookie + " "));
}

TEST_F(SessionsTest, WhatIsNoCookieOfOursIsNoSession) {
  for (const char* cookie : {"", ":", "::", ":::", "::::", "1700000000::alice:", "1:2:3:4:5",
                             "99999999999999999999:x:alice:x", "1700000000:x:%zz:x"}) {
    EXPECT_FALSE(sessions_.read(cookie)) << cookie;
  }
}

TEST_F(SessionsTest, AnotherKeyEndsAllSessions) {
  const std::string cookie = begin();
  EXPECT_FALSE(Sessions(std::string(32, 'l'), directory_, kHours).read(cookie));
}

TEST_F(SessionsTest, AChangedStampEndsTheUsersSessions) {
  const std::string alice = begin("alice");
  const std::string bob = begin("bob");
  directory_.people["alice"].stamp = "three";
  EXPECT_FALSE(sessions_.read(alice));
  EXPECT_TRUE(sessions_.read(bob));
}

TEST_F(SessionsTest, WhoIsRemovedIsSignedOut) {
  const std::string cookie = begin();
  directory_.people.erase("alice");
  EXPECT_FALSE(sessions_.read(cookie));
  EXPECT_FALSE(sessions_.begin("alice"));
}

TEST_F(SessionsTest, ADirectoryThatCannotSayEndsNothing) {
  const std::string cookie = begin();
  directory_.isBroken = true;
  EXPECT_THROW((void)sessions_.read(cookie), DirectoryTrouble);
  EXPECT_THROW((void)sessions_.begin("alice"), DirectoryTrouble);
}

TEST_F(SessionsTest, AKnownBrowserIsKnownForItsUserAlone) {
  const KnownBrowsers browsers(key_);
  const std::string cookie = browsers.remember("alice");
  EXPECT_NE(browsers.nameOf(cookie, "alice"), "");
  EXPECT_EQ(browsers.nameOf(cookie, "bob"), "");
  EXPECT_EQ(browsers.nameOf(cookie + "x", "alice"), "");
  EXPECT_EQ(browsers.nameOf("", "alice"), "");
  EXPECT_EQ(browsers.nameOf(":", "alice"), "");
  EXPECT_EQ(KnownBrowsers(std::string(32, 'l')).nameOf(cookie, "alice"), "");
}

TEST_F(SessionsTest, AKnownBrowserIsForgottenAfterHalfAYear) {
  const KnownBrowsers browsers(key_);
  const std::string cookie = browsers.remember("alice");
  Clock::setTo(kStart + KnownBrowsers::kSeconds - 1);
  EXPECT_NE(browsers.nameOf(cookie, "alice"), "");
  Clock::setTo(kStart + KnownBrowsers::kSeconds);
  EXPECT_EQ(browsers.nameOf(cookie, "alice"), "");
}

TEST_F(SessionsTest, AKnownBrowserIsNoSession) {
  EXPECT_FALSE(sessions_.read(KnownBrowsers(key_).remember("alice")));
  EXPECT_EQ(KnownBrowsers(key_).nameOf(begin(), "alice"), "");
}

}  // namespace
