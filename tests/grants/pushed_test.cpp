// Pushed authorization requests: rows among the codes that are none.

#include "grants/pushed.h"

#include "grants/rows/digest.h"
#include "tests/grants/grants_test.h"

namespace grants_test {
namespace {

using ::testing::IsEmpty;
using ::testing::SizeIs;

const RequestText kText("response_type=code&state='1'&scope=profile");

class PushedTest : public GrantsTest {
 protected:
  void SetUp() override {
    GrantsTest::SetUp();
    frame_ = add().identifier;
    other_ = add("Other").identifier;
  }
  Outcome<Pushed> tryToPush(const RequestText& text) {
    return grants().pushed.push({frame_, text});
  }
  RequestReference push() { return push(frame_); }
  RequestReference push(const ApplicationId& application) {
    return grants().pushed.push({application, kText})->reference;
  }
  Outcome<RequestText> open(const RequestReference& reference) {
    return grants().pushed.open(frame_, reference);
  }
  Outcome<IssuedCode> issueFor(const RequestReference& reference) {
    CodeRequest asked = request(frame_);
    asked.pushed = reference;
    return grants().codes.issue(asked);
  }
  static std::string pushedRows() {
    return sqlText("SELECT COUNT(*) FROM oauth_grantCode WHERE state LIKE 'p1%'");
  }

  ApplicationId frame_, other_;
};

// Pushing and opening ---------------------------------------------------------------

TEST_F(PushedTest, ARequestComesBackAsItWasPushed) {
  const auto pushed = tryToPush(kText);
  ASSERT_TRUE(pushed);
  EXPECT_EQ(pushed->expires, kNow + 60);
  EXPECT_EQ(pushed->reference.text().size(), 64U);
  EXPECT_EQ(*open(pushed->reference), kText);
}

TEST_F(PushedTest, OnlyTheDigestOfAReferenceIsStored) {
  const RequestReference reference = push();
  const std::string stored = sqlText("SELECT code FROM oauth_grantCode");
  EXPECT_EQ(stored, KELDOAUTHSERVER::grants::rows::markOf(reference.text()));
  EXPECT_EQ(whyOf(open(RequestReference(stored))), Why::kUnknown);
}

TEST_F(PushedTest, ARequestIsOfOneTo2000Bytes) {
  EXPECT_EQ(whyOf(tryToPush(RequestText(""))), Why::kOutOfBounds);
  EXPECT_EQ(whyOf(tryToPush(RequestText(std::string(2001, 'x')))), Why::kOutOfBounds);
  EXPECT_EQ(errorOf(tryToPush(RequestText(std::string(2001, 'x')))), Error::kInvalidRequest);
  const RequestText longest(std::string(2000, '\''));
  EXPECT_EQ(*open(tryToPush(longest)->reference), longest);
}

TEST_F(PushedTest, ANulByteOrABadAddressIsRefused) {
  EXPECT_EQ(whyOf(tryToPush(RequestText(std::string("a\0b", 3)))), Why::kHasNul);
  EXPECT_EQ(whyOf(grants().pushed.push({frame_, kText, PeerAddress("nowhere")})), Why::kBadPeer);
  const RequestReference withNul(push().text() + '\0');
  EXPECT_EQ(whyOf(open(withNul)), Why::kHasNul);
  EXPECT_EQ(whyOf(issueFor(withNul)), Why::kHasNul);
}

TEST_F(PushedTest, TheApplicationMustBeThereAndEnabled) {
  const RequestReference reference = push();
  grants().applications.disable(frame_, kAdmin);
  EXPECT_EQ(errorOf(tryToPush(kText)), Error::kInvalidClient);
  EXPECT_EQ(errorOf(open(reference)), Error::kInvalidClient);
  EXPECT_EQ(whyOf(grants().pushed.push({ApplicationId(support::id64('x')), kText})),
            Why::kNoApplication);
}

TEST_F(PushedTest, AnotherApplicationsRequestIsRefused) {
  const RequestReference others = push(other_);
  EXPECT_EQ(errorOf(open(others)), Error::kInvalidRequestUri);
  EXPECT_EQ(whyOf(open(others)), Why::kOtherApplication);
  EXPECT_EQ(whyOf(issueFor(others)), Why::kOtherApplication);
  EXPECT_TRUE(grants().pushed.open(other_, others));
}

TEST_F(PushedTest, WhatNobodyPushedIsUnknown) {
  const Code code = issue(frame_);
  for (const std::string& text : {std::string(), support::id64('x'), code.text()}) {
    EXPECT_EQ(whyOf(open(RequestReference(text))), Why::kUnknown) << text;
    EXPECT_EQ(whyOf(issueFor(RequestReference(text))), Why::kUnknown) << text;
  }
  EXPECT_TRUE(grants().codes.redeem(redemption(frame_, code)));
}

TEST_F(PushedTest, ARequestWaitsAMinute) {
  const RequestReference first = push();
  const RequestReference second = push();
  support::Clock::advance(59);
  EXPECT_TRUE(open(first));
  support::Clock::advance(1);
  EXPECT_EQ(whyOf(open(second)), Why::kExpired);
  EXPECT_EQ(errorOf(issueFor(second)), Error::kInvalidRequestUri);
}

TEST_F(PushedTest, ARequestThatWasOpenedWaitsTenMinutesMore) {
  const RequestReference reference = push();
  support::Clock::advance(59);
  ASSERT_TRUE(open(reference));
  support::Clock::advance(599);
  EXPECT_EQ(*open(reference), kText);  // which gives no more time
  support::Clock::advance(1);
  EXPECT_EQ(whyOf(open(reference)), Why::kExpired);
}

TEST_F(PushedTest, ThePolicySaysHowLong) {
  Policy policy;
  policy.pushed = 5;
  policy.pushedOpen = 7;
  this->GrantsTest::open(policy);
  const RequestReference reference = push();
  support::Clock::advance(4);
  ASSERT_TRUE(open(reference));
  support::Clock::advance(6);
  EXPECT_TRUE(open(reference));
  support::Clock::advance(1);
  EXPECT_EQ(whyOf(open(reference)), Why::kExpired);
}

// Its code --------------------------------------------------------------------------

TEST_F(PushedTest, OneCodeIsIssuedForARequest) {
  const RequestReference reference = push();
  ASSERT_TRUE(open(reference));
  const auto code = issueFor(reference);
  ASSERT_TRUE(code);
  EXPECT_EQ(pushedRows(), "0");
  EXPECT_EQ(errorOf(issueFor(reference)), Error::kInvalidRequestUri);
  EXPECT_EQ(whyOf(open(reference)), Why::kUnknown);
  EXPECT_TRUE(grants().codes.redeem(redemption(frame_, code->code)));
}

TEST_F(PushedTest, ARequestStaysWhenItsCodeIsRefused) {
  const RequestReference reference = push();
  CodeRequest asked = request(frame_);
  asked.pushed = reference;
  asked.withoutPage = true;
  EXPECT_EQ(whyOf(grants().codes.issue(asked)), Why::kNotRemembered);
  EXPECT_TRUE(issueFor(reference));
}

// It is no code ---------------------------------------------------------------------

TEST_F(PushedTest, AReferenceIsNoCode) {
  const RequestReference reference = push();
  const Code asCode(reference.text());
  EXPECT_EQ(whyOf(grants().codes.redeem(redemption(frame_, asCode))), Why::kUnknown);
  EXPECT_FALSE(grants().access.find(asCode));
  EXPECT_TRUE(open(reference));
}

TEST_F(PushedTest, ARequestIsNobodysAccess) {
  const RequestReference reference = push();
  AccessFilter everything;
  everything.withDead = everything.withSpent = true;
  EXPECT_THAT(grants().access.list(everything), IsEmpty());
  everything.user = User(kNoUser);
  EXPECT_THAT(grants().access.list(everything), IsEmpty());
  for (const Ended& ended :
       {grants().access.endUser(User(kNoUser), kAdmin),
        grants().access.endApplication(frame_, kAdmin), grants().access.endEverything(kAdmin)}) {
    EXPECT_EQ(ended.codes + ended.tokens, 0);
  }
  EXPECT_THAT(entries(), SizeIs(2));  // the registrations'
  EXPECT_TRUE(open(reference));
}

TEST_F(PushedTest, ARequestGoesWithItsApplication) {
  push();
  const RequestReference others = push(other_);
  EXPECT_EQ(grants().applications.remove(frame_, kAdmin)->codes, 1);
  EXPECT_EQ(pushedRows(), "1");
  EXPECT_TRUE(grants().pushed.open(other_, others));
}

TEST_F(PushedTest, ADeadRequestGoesWithAPurge) {
  push();
  EXPECT_EQ(grants().room.count().pushed, 1);
  EXPECT_EQ(grants().room.count().codes.rows, 1);
  EXPECT_EQ(grants().room.count().spentCodes, 0);
  EXPECT_EQ(grants().room.purge().codes, 0);
  support::Clock::advance(60);
  EXPECT_EQ(grants().room.count().pushed, 0);
  EXPECT_EQ(grants().room.count().codes.dead, 1);
  EXPECT_EQ(grants().room.purge().codes, 1);
}

// Bounds ----------------------------------------------------------------------------

TEST_F(PushedTest, AnApplicationHas32AndLosesItsOldest) {
  const RequestReference others = push(other_);
  const RequestReference first = push();
  support::Clock::advance(1);
  const RequestReference second = push();
  for (int i = 0; i < 31; ++i) push();
  EXPECT_EQ(whyOf(open(first)), Why::kUnknown);
  EXPECT_TRUE(open(second));
  EXPECT_TRUE(grants().pushed.open(other_, others));
}

TEST_F(PushedTest, AllTogetherKeepToAQuarterAndTakeNobodyElses) {
  writeSettings(R"({"grantcode_max": 16})");
  const RequestReference oldest = push();
  support::Clock::advance(1);
  for (int i = 0; i < 3; ++i) push();
  EXPECT_THROW(push(other_), Trouble);
  EXPECT_TRUE(open(oldest));
  push();  // in the place of its own oldest
  EXPECT_EQ(pushedRows(), "4");
  support::Clock::advance(600);
  EXPECT_NO_THROW(push(other_));
}

TEST_F(PushedTest, AFloodOfRequestsTakesNobodysCode) {
  writeSettings(R"({"grantcode_max": 16})");
  const Code code = issue(frame_);
  const Pair pair = login(frame_, kBob);
  for (int i = 0; i < 100; ++i) {
    push();
    support::Clock::advance(1);
  }
  for (const char* user : {"c", "d", "e", "f", "g"}) issue(frame_, User(user));
  EXPECT_TRUE(grants().codes.redeem(redemption(frame_, code)));
  EXPECT_TRUE(isGood(pair));
}

TEST_F(PushedTest, RequestsKeepNoApplicationRegisteredThatRegisteredItself) {
  writeSettings(R"({"client_info_max": 8})");
  NewApplication itself{ApplicationName("Itself"), {kAddress}, kScope};
  itself.registersItself = true;
  std::vector<ApplicationId> all;
  for (int i = 0; i < 5; ++i) {
    all.push_back(grants().applications.add(itself, kAdmin)->identifier);
    push(all.back());
  }
  EXPECT_FALSE(grants().applications.find(all.front()));
  EXPECT_TRUE(grants().applications.find(all.back()));
}

}  // namespace
}  // namespace grants_test
