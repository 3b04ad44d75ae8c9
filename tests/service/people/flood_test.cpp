// What a flood of names does to those who are counted beside it. Seeds are fixed:
// every run sees the same flood.

#include <algorithm>

#include "service/people/throttle.h"
#include "tests/service/people/scene.h"

namespace {

using keldoauth::service::Deed;
using keldoauth::service::Throttle;
using support::Clock;

constexpr Deed kDeed = Deed::kSignInOfAccount;

class FloodTest : public scene::Folder {
 protected:
  void SetUp() override {
    Folder::SetUp();
    Clock::setTo(1700000000);
  }
  /// How many of `count` tries of one name are let through.
  int allowed(const std::string& whom, int count) {
    int allowed = 0;
    for (int i = 0; i < count; ++i) allowed += throttle().take(kDeed, whom) == 0 ? 1 : 0;
    return allowed;
  }
  Throttle& throttle() {
    if (!throttle_) throttle_.emplace(at("counters"), "key");
    return *throttle_;
  }

 private:
  std::optional<Throttle> throttle_;
};

TEST_F(FloodTest, NobodyPaysForTwentyThousandOthers) {
  for (int i = 0; i < 20000; ++i) throttle().take(kDeed, "flood" + std::to_string(i));
  for (int i = 0; i < 1000; ++i) {
    EXPECT_EQ(throttle().take(kDeed, "user" + std::to_string(i)), 0) << i;
  }
}

TEST_F(FloodTest, NobodyPaysForAThousandWhoAreUsedUp) {
  for (int i = 0; i < 1000; ++i) allowed("flood" + std::to_string(i), 11);
  for (int i = 0; i < 1000; ++i) {
    EXPECT_EQ(throttle().take(kDeed, "user" + std::to_string(i)), 0) << i;
  }
}

TEST_F(FloodTest, AnAttackedAccountIsNotForgotten) {
  EXPECT_EQ(allowed("alice", 20), 10);
  for (int i = 0; i < 20000; ++i) throttle().take(kDeed, "flood" + std::to_string(i));
  EXPECT_EQ(allowed("alice", 20), 0);
}

/// Every guess at one account hides among a hundred at names that do not exist.
TEST_F(FloodTest, NoiseBuysFewGuesses) {
  int guesses = 0;
  int names = 0;
  for (int i = 0; i < 400; ++i) {
    guesses += throttle().take(kDeed, "alice") == 0 ? 1 : 0;
    for (int j = 0; j < 100; ++j) throttle().take(kDeed, "flood" + std::to_string(names++));
  }
  EXPECT_LE(guesses, 40) << "40,000 other failures";
}

/// The dearest flood: all slots are brought to their end first and kept there.
TEST_F(FloodTest, AFullTableStillCountsWhoComesLast) {
  for (int i = 0; i < 8000; ++i) allowed("flood" + std::to_string(i), 10);
  EXPECT_LE(allowed("alice", 20), 10);
  EXPECT_GE(allowed("bob", 1), 1);
}

TEST_F(FloodTest, AThousandPeopleAreAllCountedExactly) {
  for (int i = 0; i < 1000; ++i) {
    EXPECT_EQ(allowed("user" + std::to_string(i), 9), 9);
  }
  for (int i = 0; i < 1000; ++i) {
    EXPECT_EQ(allowed("user" + std::to_string(i), 3), 1) << i;
  }
}

}  // namespace
