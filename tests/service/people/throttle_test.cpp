#include "service/people/throttle.h"

#include <sys/stat.h>

#include <fstream>
#include <random>

#include "tests/service/people/scene.h"

namespace {

using keldoauth::service::Deed;
using keldoauth::service::Throttle;
using support::Clock;
using support::SystemLog;

constexpr long long kStart = 1700000000;

class ThrottleTest : public scene::Folder {
 protected:
  void SetUp() override {
    Folder::SetUp();
    Clock::setTo(kStart);
  }

  int take(const std::string& whom = "a", Deed deed = Deed::kSignInFromAddress) {
    return Throttle(at("counters"), "key").take(deed, whom);
  }
  void useUp(const std::string& whom = "a", Deed deed = Deed::kSignInFromAddress) {
    for (int i = 0; i < 1000; ++i) {
      if (take(whom, deed) != 0) return;
    }
    FAIL() << "no end to it";
  }
};

TEST_F(ThrottleTest, EveryDeedHasItsAllowance) {
  struct Row {
    Deed deed;
    int atOnce;
    int everySeconds;
  };
  for (const Row& row :
       {Row{Deed::kSignInFromAddress, 10, 60}, Row{Deed::kSignInOfAccount, 10, 600},
        Row{Deed::kSignInOfKnownBrowser, 10, 60}, Row{Deed::kWrongSecretFromAddress, 20, 5},
        Row{Deed::kRegistrationFromAddress, 60, 60}}) {
    for (int i = 0; i < row.atOnce; ++i) EXPECT_EQ(take("a", row.deed), 0) << i;
    EXPECT_EQ(take("a", row.deed), row.everySeconds);
  }
}

TEST_F(ThrottleTest, TheWaitIsTrueToTheSecond) {
  useUp();
  Clock::advance(59);
  EXPECT_EQ(take(), 1);
  Clock::advance(1);
  EXPECT_EQ(take(), 0);
  EXPECT_EQ(take(), 60);
}

TEST_F(ThrottleTest, WhoIsRefusedDoesNotWaitLongerForIt) {
  useUp();
  for (int i = 0; i < 100; ++i) EXPECT_EQ(take(), 60);
}

TEST_F(ThrottleTest, AfterAllTheTimeTheAllowanceIsWhole) {
  useUp();
  Clock::advance(600);
  for (int i = 0; i < 10; ++i) EXPECT_EQ(take(), 0);
  EXPECT_EQ(take(), 60);
}

TEST_F(ThrottleTest, NamesAndDeedsAreCountedApart) {
  useUp("a");
  EXPECT_EQ(take("b"), 0);
  EXPECT_EQ(take("a", Deed::kSignInOfAccount), 0);
}

TEST_F(ThrottleTest, WhatIsGivenBackWasNeverTaken) {
  Throttle throttle(at("counters"), "key");
  for (int i = 0; i < 100; ++i) {
    EXPECT_EQ(throttle.take(Deed::kSignInFromAddress, "a"), 0);
    throttle.giveBack(Deed::kSignInFromAddress, "a");
  }
}

TEST_F(ThrottleTest, NothingIsGivenBackBeyondTheWhole) {
  Throttle throttle(at("counters"), "key");
  throttle.giveBack(Deed::kSignInFromAddress, "a");
  throttle.take(Deed::kSignInFromAddress, "a");
  for (int i = 0; i < 5; ++i) throttle.giveBack(Deed::kSignInFromAddress, "a");
  for (int i = 0; i < 10; ++i) EXPECT_EQ(take(), 0);
  EXPECT_EQ(take(), 60);
}

TEST_F(ThrottleTest, ANameIsOfAnyBytes) {
  useUp(std::string("a\0b", 3));
  EXPECT_EQ(take("a"), 0);
  EXPECT_EQ(take(""), 0);
  EXPECT_EQ(take(std::string(100000, 'x')), 0);
}

TEST_F(ThrottleTest, AClockThatIsSetBackLocksNobodyOut) {
  useUp();
  Clock::advance(-86400);
  EXPECT_EQ(take(), 0);
}

TEST_F(ThrottleTest, CountsOnWhenTheSecondsOutgrow32Bits) {
  Clock::setTo((1LL << 32) - 30);
  useUp();
  Clock::advance(59);
  EXPECT_EQ(take(), 1);
  Clock::advance(1);
  EXPECT_EQ(take(), 0);
}

TEST_F(ThrottleTest, CountsOnAfter2038) {
  Clock::setTo((1LL << 31) - 30);
  useUp();
  Clock::advance(60);
  EXPECT_EQ(take(), 0);
  EXPECT_EQ(take(), 60);
}

TEST_F(ThrottleTest, AnEmptyPathCountsNothing) {
  Throttle throttle("", "key");
  for (int i = 0; i < 100; ++i) EXPECT_EQ(throttle.take(Deed::kSignInFromAddress, "a"), 0);
  EXPECT_TRUE(SystemLog::lines().empty());
}

TEST_F(ThrottleTest, WithoutAFileEverythingIsAllowedAndSaidOnce) {
  ASSERT_EQ(mkdir(at("counters").c_str(), 0700), 0);
  Throttle throttle(at("counters"), "key");
  for (int i = 0; i < 100; ++i) EXPECT_EQ(throttle.take(Deed::kSignInFromAddress, "a"), 0);
  EXPECT_EQ(SystemLog::texts(),
            std::vector<std::string>{"cannot keep counters: failed sign-ins are not slowed down"});
}

TEST_F(ThrottleTest, ADamagedFileLocksNobodyOut) {
  take();
  std::fstream file(at("counters"), std::ios::in | std::ios::out | std::ios::binary);
  file.seekp(128);
  std::minstd_rand noise(1);
  for (std::size_t i = 0; i < 1280 * 128; ++i) file.put(static_cast<char>(noise() >> 16U));
  file.close();
  for (int i = 0; i < 2000; ++i) EXPECT_EQ(take("user" + std::to_string(i)), 0);
}

TEST_F(ThrottleTest, TheFileShowsNobodysName) {
  take("a-name-to-look-for");
  EXPECT_EQ(read("counters").find("a-name"), std::string::npos);
}

}  // namespace
