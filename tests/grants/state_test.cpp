// What rides in the column `state`.

#include "grants/rows/state.h"

#include <gtest/gtest.h>

#include <limits>
#include <string>

namespace {

using namespace KELDOAUTHSERVER::grants::rows;

// The number with the longest text.
constexpr long long kLowest = std::numeric_limits<long long>::min();

const std::string kHostile("it's 1:2 \xff\xfe '' \n 3:abc");

CodeState code() {
  return {"https://a.example/'x'?y=1:2", true, "S", "challenge", 1700000000, kHostile};
}

TokenState token() {
  return {1, 2, 3, "family", "refresh", "access", "a b'c", kHostile};
}

TEST(StateTest, ACodeComesBackAsItWas) {
  const auto state = unpackCode(pack(code()));
  ASSERT_TRUE(state);
  EXPECT_EQ(state->redirect, code().redirect);
  EXPECT_TRUE(state->isNamed);
  EXPECT_EQ(state->method, "S");
  EXPECT_EQ(state->challenge, "challenge");
  EXPECT_EQ(state->issued, 1700000000);
  EXPECT_EQ(state->text, kHostile);
  EXPECT_FALSE(state->spent);
}

TEST(StateTest, ACodeRemembersThatItEvictsNothing) {
  for (const bool isNamed : {false, true}) {
    for (const bool evictsNothing : {false, true}) {
      CodeState state = code();
      state.isNamed = isNamed;
      state.evictsNothing = evictsNothing;
      const auto back = unpackCode(pack(state));
      ASSERT_TRUE(back);
      EXPECT_EQ(back->isNamed, isNamed);
      EXPECT_EQ(back->evictsNothing, evictsNothing);
      EXPECT_EQ(pack(*back).size(), pack(code()).size());
    }
  }
  EXPECT_FALSE(unpackCode("c11:10:1:40:0:0:"));
  EXPECT_FALSE(unpackCode("c11:10:2:-10:0:0:"));
}

TEST(StateTest, ASpentCodeComesBackAsItWas) {
  CodeState spent = code();
  spent.isNamed = false;
  spent.spent = Spent{1700000001, 42, "family"};
  const auto state = unpackCode(pack(spent));
  ASSERT_TRUE(state && state->spent);
  EXPECT_FALSE(state->isNamed);
  EXPECT_EQ(state->spent->time, 1700000001);
  EXPECT_EQ(state->spent->tokenRow, 42);
  EXPECT_EQ(state->spent->family, "family");
  EXPECT_EQ(state->text, kHostile);
}

TEST(StateTest, APushedRequestComesBackAsItWas) {
  for (const bool isOpen : {false, true}) {
    const std::string text = pack(PushedState{1700000000, isOpen, kHostile});
    const auto state = unpackPushed(text);
    ASSERT_TRUE(state);
    EXPECT_EQ(state->issued, 1700000000);
    EXPECT_EQ(state->isOpen, isOpen);
    EXPECT_EQ(state->text, kHostile);
    for (std::size_t i = 0; i < text.size(); ++i) EXPECT_FALSE(unpackPushed(text.substr(0, i)));
    EXPECT_FALSE(unpackPushed(text + "0:"));
    EXPECT_FALSE(unpackCode(text) || unpackToken(text));
  }
  EXPECT_FALSE(unpackPushed(pack(code())));
  EXPECT_FALSE(unpackPushed("p11:11:21:x"));
}

TEST(StateTest, ATokenComesBackAsItWas) {
  const auto state = unpackToken(pack(token()));
  ASSERT_TRUE(state);
  EXPECT_EQ(state->login, 1);
  EXPECT_EQ(state->redeemed, 2);
  EXPECT_EQ(state->issued, 3);
  EXPECT_EQ(state->family, "family");
  EXPECT_EQ(state->refreshBefore, "refresh");
  EXPECT_EQ(state->accessBefore, "access");
  EXPECT_EQ(state->loginScope, "a b'c");
  EXPECT_EQ(state->text, kHostile);
}

TEST(StateTest, ATextIsPackedInOneWayOnly) {
  const std::string text = pack(code());
  EXPECT_EQ(pack(*unpackCode(text)), text);
  EXPECT_FALSE(unpackCode("c101:x1:10:0:1:00:"));  // a length with a leading zero
  EXPECT_FALSE(unpackCode("c11:x1:10:0:2:000:"));  // a number with one
}

TEST(StateTest, EveryTextThatIsCutShortIsRefused) {
  CodeState spent = code();
  spent.spent = Spent{1, 2, "family"};
  const std::string asCode = pack(code());
  const std::string asSpent = pack(spent);
  const std::string asToken = pack(token());
  for (std::size_t i = 0; i < asCode.size(); ++i) EXPECT_FALSE(unpackCode(asCode.substr(0, i)));
  for (std::size_t i = 0; i < asSpent.size(); ++i) EXPECT_FALSE(unpackCode(asSpent.substr(0, i)));
  for (std::size_t i = 0; i < asToken.size(); ++i) EXPECT_FALSE(unpackToken(asToken.substr(0, i)));
}

TEST(StateTest, ATextWithSomethingBehindItIsRefused) {
  EXPECT_FALSE(unpackCode(pack(code()) + "0:"));
  EXPECT_FALSE(unpackToken(pack(token()) + "x"));
}

TEST(StateTest, OneKindIsNotTakenForTheOther) {
  EXPECT_FALSE(unpackToken(pack(code())));
  EXPECT_FALSE(unpackCode(pack(token())));
}

TEST(StateTest, OtherProgramsTextsAreRefused) {
  for (const char* text : {"", "af0ifjsldkj", "c", "c1", "s1", "t1", "c2", "c1:", "c1-1:x",
                           "c199999999999999999999:x", "t118446744073709551615:x"}) {
    EXPECT_FALSE(unpackCode(text)) << text;
    EXPECT_FALSE(unpackToken(text)) << text;
  }
}

TEST(StateTest, WhatFitsOnceFitsForEver) {
  CodeState state = code();
  state.text = std::string(512, 't');
  state.redirect = "";
  std::string scope(1, 's');
  while (fitsEver(state, scope)) scope += 's';
  scope.pop_back();

  const std::string mark(64, 'm');
  constexpr long long kFar = 9999999999999;
  EXPECT_LE(pack(TokenState{kFar, kFar, kFar, mark, mark, mark, scope, state.text}).size(), 2048U);
  EXPECT_GT(scope.size(), 1000U);

  // With numbers of all the digits that there are, the column is full.
  EXPECT_EQ(pack(TokenState{kLowest, kLowest, kLowest, mark, mark, mark, scope, state.text}).size(),
            2048U);
}

TEST(StateTest, TheAddressOfACodeThatIsSpentCounts) {
  CodeState state = code();
  state.text = "";
  while (fitsEver(state, "s")) state.redirect += 'x';
  state.redirect.pop_back();
  state.spent = Spent{9999999999999, 9999999999999, std::string(64, 'm')};
  EXPECT_LE(pack(state).size(), 2048U);
  EXPECT_GT(state.redirect.size(), 1400U);

  state.spent = Spent{kLowest, kLowest, std::string(64, 'm')};
  EXPECT_EQ(pack(state).size(), 2048U);
}

}  // namespace
