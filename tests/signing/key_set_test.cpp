#include "service/signing/key_set.h"

#include <limits>

#include "tests/signing/signing_test.h"

namespace signing_test {
namespace {

using ::testing::ElementsAre;

class KeySetTest : public SigningTest {
 protected:
  KeySet set_ = anySet();

  /// Of the keys of one algorithm, the oldest first.
  [[nodiscard]] std::vector<State> states(Time now, Algorithm algorithm = Algorithm::kEs256) const {
    std::vector<State> found;
    for (std::size_t i = 0; i < set_.keys().size(); ++i) {
      if (set_.keys()[i].key.algorithm() == algorithm) found.push_back(set_.stateOf(i, now));
    }
    return found;
  }
  [[nodiscard]] std::string signer(Time now, Algorithm algorithm = Algorithm::kEs256) const {
    return set_.signingKey(algorithm, now).identifier();
  }
  [[nodiscard]] bool isPublished(const std::string& identifier, Time now) const {
    const Json::Value published = set_.publicSet(now);
    for (const Json::Value& jwk : published["keys"]) {
      if (jwk["kid"] == identifier) return true;
    }
    return false;
  }
};

TEST_F(KeySetTest, FreshOneSignsWithBothAlgorithmsAtOnce) {
  EXPECT_THAT(states(kStart, Algorithm::kRs256), ElementsAre(State::kCurrent));
  EXPECT_THAT(states(kStart, Algorithm::kEs256), ElementsAre(State::kCurrent));
  EXPECT_EQ(set_.publicSet(kStart)["keys"].size(), 2U);
}

TEST_F(KeySetTest, KeyIsPublishedBeforeItSigns) {
  const std::string old = signer(kStart);
  set_.rotate(kStart + kDay);
  EXPECT_THAT(states(kStart + kDay), ElementsAre(State::kCurrent, State::kNext));
  EXPECT_EQ(set_.publicSet(kStart + kDay)["keys"].size(), 4U);
  EXPECT_EQ(signer(kStart + kDay + kAhead - 1), old);
  EXPECT_NE(signer(kStart + kDay + kAhead), old);
}

TEST_F(KeySetTest, KeyThatSignsNoMoreIsPublishedUntilAllItSignedHasExpired) {
  const std::string old = signer(kStart);
  set_.rotate(kStart);
  const Time change = kStart + kAhead;
  EXPECT_TRUE(isPublished(old, change + kAfter - 1));
  EXPECT_THAT(states(change + kAfter - 1), ElementsAre(State::kPrevious, State::kCurrent));
  EXPECT_FALSE(isPublished(old, change + kAfter));
  EXPECT_THAT(states(change + kAfter), ElementsAre(State::kOver, State::kCurrent));
}

TEST_F(KeySetTest, NextRotationRemovesWhatIsOver) {
  const std::string old = signer(kStart);
  set_.rotate(kStart);
  set_.rotate(kStart + kAhead + kAfter);
  EXPECT_EQ(set_.find(old), nullptr);
  EXPECT_THAT(states(kStart + kAhead + kAfter), ElementsAre(State::kCurrent, State::kNext));
}

TEST_F(KeySetTest, ForgettingRemovesWhatIsOverAndMakesNothing) {
  const std::string old = signer(kStart);
  set_.rotate(kStart);
  set_.forget(kStart + kAhead + kAfter - 1);
  EXPECT_NE(set_.find(old), nullptr);
  set_.forget(kStart + kAhead + kAfter);
  EXPECT_EQ(set_.find(old), nullptr);
  EXPECT_THAT(states(kStart + kAhead + kAfter), ElementsAre(State::kCurrent));
}

TEST_F(KeySetTest, RotationsInARowAreOne) {
  set_.rotate(kStart);
  const std::string once = set_.text();
  set_.rotate(kStart);
  set_.rotate(kStart + kAhead - 1);
  EXPECT_EQ(set_.text(), once);
}

// Every hour for ten days, and every signature is good for kAfter: whoever read
// the published keys kAhead ago or later can check it.
TEST_F(KeySetTest, WhateverIsSignedCanBeCheckedWithKeysReadADayAgo) {
  constexpr Time kHour = 3600;
  std::vector<std::pair<Time, std::string>> signers;
  for (Time now = kStart; now < kStart + 10 * kDay; now += kHour) {
    if ((now - kStart) % (7 * kHour) == 0) set_.rotate(now);
    signers.emplace_back(now, signer(now));
    EXPECT_TRUE(isPublished(signer(now + kAhead - 1), now)) << now - kStart;
    for (const auto& [time, identifier] : signers) {
      EXPECT_TRUE(now - time >= kAfter || isPublished(identifier, now)) << now - kStart;
    }
    EXPECT_LE(set_.keys().size(), 8U);
  }
  EXPECT_NE(signers.front().second, signers.back().second);
}

TEST_F(KeySetTest, ReplacedKeysAreGoneAtOnce) {
  const std::string old = signer(kStart);
  set_.rotate(kStart);
  set_.replace(kStart + 1);
  EXPECT_EQ(set_.find(old), nullptr);
  EXPECT_THAT(states(kStart + 1), ElementsAre(State::kCurrent));
  EXPECT_THAT(states(kStart + 1, Algorithm::kRs256), ElementsAre(State::kCurrent));
}

TEST_F(KeySetTest, SomeKeySignsWhateverTheClockSays) {
  set_.rotate(kStart);
  for (const Time now : {Time{0}, Time{-1}, kStart - 1, Time{253402300799}}) {
    EXPECT_NE(signer(now), "");
    EXPECT_TRUE(isPublished(signer(now), now)) << now;
  }
}

TEST_F(KeySetTest, ClockBeforeAllKeysLeavesTheOldestSigning) {
  const std::string old = signer(kStart);
  set_.rotate(kStart);
  EXPECT_EQ(signer(0), old);
  EXPECT_THAT(states(0), ElementsAre(State::kCurrent, State::kNext));
}

TEST_F(KeySetTest, KeysMadeUnderAClockSetForwardSignADayAfterTheNextRotation) {
  set_.rotate(kStart + 4000 * kDay);
  EXPECT_THAT(states(kStart + kDay), ElementsAre(State::kCurrent, State::kNext));
  const std::string old = signer(kStart + kDay);
  set_.rotate(kStart + kDay);
  EXPECT_EQ(signer(kStart + kDay + kAhead - 1), old);
  EXPECT_NE(signer(kStart + kDay + kAhead), old);
}

TEST_F(KeySetTest, SetMadeUnderAClockSetForwardRotatesInOrder) {
  const std::string old = signer(kStart);
  const Time now = kStart - 4000 * kDay;
  set_.rotate(now);
  EXPECT_EQ(signer(now), old);
  EXPECT_EQ(signer(now + kAhead - 1), old);
  EXPECT_NE(signer(now + kAhead), old);
}

TEST_F(KeySetTest, IsDueWhenAKeyWithoutSuccessorHasSignedForSoLong) {
  EXPECT_FALSE(set_.isDue(kStart + 90 * kDay - 1, 90 * kDay));
  EXPECT_TRUE(set_.isDue(kStart + 90 * kDay, 90 * kDay));
  set_.rotate(kStart + 90 * kDay);
  EXPECT_FALSE(set_.isDue(kStart + 90 * kDay, 90 * kDay));
}

TEST_F(KeySetTest, PublicSetHasNoSecret) {
  const std::string text = written(set_.publicSet(kStart));
  for (const DatedKey& dated : set_.keys()) {
    const Json::Value jwk = dated.key.privateJwk();
    for (const char* secret : {"d", "p", "q", "dp", "dq", "qi"}) {
      if (!jwk.isMember(secret)) continue;
      EXPECT_EQ(text.find(jwk[secret].asString()), std::string::npos) << secret;
    }
  }
}

}  // namespace
}  // namespace signing_test
