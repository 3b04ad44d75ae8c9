// Nobody can push others out: floods, and what becomes of everybody else.

#include "stores/oauth_token.h"
#include "tests/grants/grants_test.h"
#include "utils/oauth_names.h"

namespace grants_test {
namespace {

using ::testing::Contains;
using ::testing::HasSubstr;

class FloodsTest : public GrantsTest {
 protected:
  void SetUp() override {
    GrantsTest::SetUp();
    frame_ = add().identifier;
    others_ = add("Others").identifier;
    bob_ = login(others_, kBob);
  }

  static std::string rows(const std::string& table) {
    return sqlText("SELECT COUNT(*) FROM " + table);
  }
  /// Everybody else stays logged in, and can log in.
  void expectOthersUnharmed() {
    EXPECT_TRUE(isGood(bob_));
    bob_ = refresh(others_, bob_);
    EXPECT_TRUE(isGood(login(others_, User("carol"))));
    EXPECT_THAT(entries(), Contains(HasSubstr("registered[Photo Frame")));
  }
  bool tryToLogIn(const ApplicationId& application, const User& user) try {
    login(application, user);
    return true;
  } catch (const Trouble&) {
    return false;
  }

  ApplicationId frame_, others_;
  Pair bob_;
};

TEST_F(FloodsTest, AUserHasThreeCodesForAnApplication) {
  std::vector<Code> codes;
  for (int i = 0; i < 5; ++i) {
    codes.push_back(issue(frame_));
    support::Clock::advance(1);
  }
  EXPECT_EQ(rows("oauth_grantCode WHERE state LIKE 'c1%'"), "3");
  for (const std::size_t i : {0U, 1U}) {
    EXPECT_EQ(whyOf(grants().codes.redeem(redemption(frame_, codes.at(i)))), Why::kUnknown);
  }
  for (const std::size_t i : {2U, 3U, 4U}) {
    EXPECT_TRUE(grants().codes.redeem(redemption(frame_, codes.at(i))));
  }
}

TEST_F(FloodsTest, AUserHasEightLoginsWithAnApplication) {
  std::vector<Pair> pairs;
  for (int i = 0; i < 8; ++i) {
    pairs.push_back(login(frame_));
    support::Clock::advance(1);
  }
  pairs[0] = refresh(frame_, pairs[0]);
  support::Clock::advance(1);
  const Pair ninth = login(frame_);
  EXPECT_FALSE(isGood(pairs[1]));  // renewed longest ago
  EXPECT_TRUE(isGood(pairs[0]));
  EXPECT_TRUE(isGood(ninth));
  expectOthersUnharmed();
}

TEST_F(FloodsTest, AnApplicationHas32TokensOfItsOwn) {
  const Pair first = *grants().tokens.issueToItself({frame_});
  support::Clock::advance(1);
  for (int i = 0; i < 32; ++i) ASSERT_TRUE(grants().tokens.issueToItself({frame_}));
  EXPECT_FALSE(isGood(first));
  EXPECT_EQ(rows("oauth_token WHERE flow_type='client_credentials'"), "32");
  expectOthersUnharmed();
}

TEST_F(FloodsTest, WhatIsDeadDoesNotCount) {
  for (int i = 0; i < 8; ++i) login(frame_);
  support::Clock::advance(31 * kDay);
  const Pair first = login(frame_);
  for (int i = 0; i < 7; ++i) login(frame_);
  EXPECT_TRUE(isGood(first));
}

TEST_F(FloodsTest, AUserWithManyApplicationsKeepsToAQuarter) {
  writeSettings(R"({"token_max": 40, "grantcode_max": 40})");
  std::vector<ApplicationId> applications;
  for (int i = 0; i < 15; ++i) {
    applications.push_back(add("Application " + std::to_string(i)).identifier);
  }
  for (int round = 0; round < 3; ++round) {
    for (const ApplicationId& application : applications) {
      login(application);
      issue(application);
      support::Clock::advance(1);
    }
  }
  EXPECT_EQ(rows("oauth_token WHERE username='alice'"), "10");
  EXPECT_EQ(rows("oauth_grantCode WHERE username='alice'"), "10");
  expectOthersUnharmed();
}

TEST_F(FloodsTest, AnApplicationWithManyUsersKeepsToHalf) {
  writeSettings(R"({"token_max": 40, "grantcode_max": 40})");
  for (int i = 0; i < 60; ++i) {
    login(frame_, User("user" + std::to_string(i)));
    issue(frame_, User("user" + std::to_string(i)));
    support::Clock::advance(1);
  }
  EXPECT_EQ(rows("oauth_token"), "21");
  expectOthersUnharmed();
}

TEST_F(FloodsTest, OneWhoLogsInForEverKeepsWhatOthersSpent) {
  writeSettings(R"({"grantcode_max": 20})");
  for (int i = 0; i < 100; ++i) {
    login(frame_);
    support::Clock::advance(1);
  }
  EXPECT_EQ(rows("oauth_grantCode WHERE username='alice'"), "5");
  EXPECT_EQ(rows("oauth_grantCode WHERE username='bob'"), "1");
  expectOthersUnharmed();
}

TEST_F(FloodsTest, AFullTableOfTheLivingLogsNobodyOut) {
  writeSettings(R"({"token_max": 4})");
  Policy policy;
  policy.userPart = policy.applicationPart = 1;
  open(policy);
  const Pair alice = login(frame_);
  const Pair carol = login(frame_, User("carol"));
  const Pair dave = login(others_, User("dave"));
  support::SystemLog::clear();
  EXPECT_FALSE(tryToLogIn(others_, User("erin")));
  EXPECT_THAT(support::SystemLog::texts(), ::testing::ElementsAre("grants:10 Token Table is full"));
  for (const Pair& pair : {alice, carol, dave, bob_}) EXPECT_TRUE(isGood(pair));
}

TEST_F(FloodsTest, AFullTableLosesWhatIsDead) {
  writeSettings(R"({"token_max": 4, "grantcode_max": 4})");
  Policy policy;
  policy.userPart = policy.applicationPart = 1;
  open(policy);
  for (const char* user : {"a", "b", "c"}) login(frame_, User(user));
  bob_ = refresh(others_, bob_);
  support::Clock::advance(30 * kDay);
  bob_ = refresh(others_, bob_);
  support::Clock::advance(kDay);
  EXPECT_TRUE(tryToLogIn(frame_, kAlice));
  EXPECT_EQ(rows("oauth_token"), "2");
  EXPECT_TRUE(grants().tokens.refresh({others_, *bob_.refresh}));
}

TEST_F(FloodsTest, SpentCodesGiveWayAndLivingOnesDoNot) {
  writeSettings(R"({"grantcode_max": 3})");
  Policy policy;
  policy.userPart = policy.applicationPart = 1;
  open(policy);
  const Code code = issue(frame_);  // beside the one that bob spent
  issue(frame_, User("carol"));
  issue(others_, User("dave"));
  EXPECT_EQ(rows("oauth_grantCode WHERE username='bob'"), "0");
  EXPECT_THROW(issue(frame_, User("erin")), Trouble);
  EXPECT_TRUE(grants().codes.redeem(redemption(frame_, code)));
}

TEST_F(FloodsTest, EvictionsLeaveNoEntry) {
  for (int i = 0; i < 20; ++i) login(frame_);
  EXPECT_EQ(entries().size(), 2U);
}

// At the size of a box as it is delivered: 1000 rows in each table.

using FullSizeFloodsTest = FloodsTest;

TEST_F(FullSizeFloodsTest, AnApplicationThatFetchesAThousandTokens) {
  for (int i = 0; i < 1000; ++i) ASSERT_TRUE(grants().tokens.issueToItself({frame_}));
  expectOthersUnharmed();
}

TEST_F(FullSizeFloodsTest, AUserWhoSendsOneFormAThousandTimes) {
  for (int i = 0; i < 1000; ++i) issue(frame_);
  expectOthersUnharmed();
}

TEST_F(FullSizeFloodsTest, AUserWhoLogsInAThousandTimes) {
  for (int i = 0; i < 1000; ++i) login(frame_);
  expectOthersUnharmed();
}

TEST_F(FullSizeFloodsTest, AHundredAndTwentyFiveApplicationsOfOneUser) {
  for (int i = 0; i < 125; ++i) {
    const ApplicationId application = add("Application " + std::to_string(i)).identifier;
    for (int j = 0; j < 8; ++j) login(application);
  }
  EXPECT_EQ(rows("oauth_token WHERE username='alice'"), "250");
  expectOthersUnharmed();
}

TEST_F(FullSizeFloodsTest, AHundredAndTwentyFiveUsersOfOneApplication) {
  for (int i = 0; i < 125; ++i) {
    for (int j = 0; j < 8; ++j) login(frame_, User("user" + std::to_string(i)));
  }
  EXPECT_EQ(rows("oauth_token WHERE username<>'bob'"), "500");
  expectOthersUnharmed();
}

TEST_F(FloodsTest, WhatGoesFirstWasRenewedLongestAgoHoweverLongItLasts) {
  std::vector<Pair> pairs;
  for (int i = 0; i < 8; ++i) {
    pairs.push_back(*grants().tokens.issue({kAlice, frame_, kScope, {}, {}, kDay}));
    support::Clock::advance(1);
  }
  for (int i = 0; i < 4; ++i) {  // from now on they last for ten minutes
    pairs.push_back(login(frame_));
    support::Clock::advance(1);
  }
  for (std::size_t i = 0; i < pairs.size(); ++i) EXPECT_EQ(isGood(pairs[i]), i >= 4) << i;
}

TEST_F(FloodsTest, AnotherProgramsRowsTakeTheirTurn) {
  Json::Value out;
  KELDOAUTHSERVER::OAUTHDBToken foreign(KELDOAUTHSERVER::names::kTokenTable);
  foreign.Add("alice", frame_.text(), "profile", "password", "state", "", out);
  support::Clock::advance(1);
  std::vector<Pair> pairs;
  for (int i = 0; i < 8; ++i) pairs.push_back(login(frame_));
  EXPECT_FALSE(isGood(AccessToken(out[KELDOAUTHSERVER::names::kAccessToken].asString())));
  for (const Pair& pair : pairs) EXPECT_TRUE(isGood(pair));
}

// Applications that register themselves ------------------------------------------------

class SelfRegistrationTest : public FloodsTest {
 protected:
  void SetUp() override {
    FloodsTest::SetUp();
    writeSettings(R"({"client_info_max": 10})");
  }
  Registered addItself(int number) {
    NewApplication application{
        ApplicationName("Self " + std::to_string(number)), {kAddress}, kScope};
    application.registersItself = true;
    return *grants().applications.add(application, Actor("unknown"));
  }
};

TEST_F(SelfRegistrationTest, KeepToHalfOfTheRegistry) {
  for (int i = 0; i < 20; ++i) addItself(i);
  EXPECT_EQ(grants().applications.all().size(), 7U);
  EXPECT_THAT(grants().applications.named(ApplicationName("Self 19")), ::testing::SizeIs(1));
  EXPECT_THAT(grants().applications.named(ApplicationName("Self 0")), ::testing::IsEmpty());
  add("The owner's");
  expectOthersUnharmed();
}

TEST_F(SelfRegistrationTest, KeepToThePartThatThePolicySays) {
  // Two of the ten are the owner's. A part below 1 counts as 1.
  const std::pair<int, std::size_t> rooms[] = {{1, 8}, {0, 8}, {-1, 8}, {3, 3}, {10, 1}, {11, 1}};
  for (const auto& [part, room] : rooms) {
    Policy policy;
    policy.selfRegisteredPart = part;
    open(policy);
    for (int i = 0; i < 8; ++i) addItself(i);
    EXPECT_EQ(grants().applications.all().size(), 2 + room) << part;
    sql("DELETE FROM oauth_clientInfo WHERE display_name LIKE 'Self %'");
  }
}

TEST_F(SelfRegistrationTest, EachTakesTheOldestOnesPlaceAlone) {
  const auto isThere = [this](int number) {
    const ApplicationName name("Self " + std::to_string(number));
    return !grants().applications.named(name).empty();
  };
  for (int i = 0; i < 12; ++i) {
    addItself(i);
    for (int other = 0; other <= i; ++other) EXPECT_EQ(isThere(other), other > i - 5) << i;
  }
}

TEST_F(SelfRegistrationTest, OneThatIsUsedStays) {
  const ApplicationId used = addItself(0).identifier;
  const Pair pair = login(used);
  for (int i = 1; i < 20; ++i) addItself(i);
  EXPECT_TRUE(isGood(pair));
}

TEST_F(SelfRegistrationTest, WhenAllAreUsedTheRegistryIsFull) {
  for (int i = 0; i < 5; ++i) login(addItself(i).identifier);
  EXPECT_THROW(addItself(5), Trouble);
  EXPECT_EQ(grants().applications.all().size(), 7U);
}

TEST_F(SelfRegistrationTest, AFullRegistryOfALowerLimitKeepsThemAll) {
  for (int i = 0; i < 5; ++i) addItself(i);
  for (int i = 0; i < 3; ++i) add("The owner's " + std::to_string(i));
  for (const int limit : {8, 7, 6}) {  // two of the five would go for the first
    writeSettings(R"({"client_info_max": )" + std::to_string(limit) + "}");
    EXPECT_THROW(addItself(5), Trouble) << limit;
    EXPECT_EQ(grants().applications.all().size(), 10U) << limit;
  }
  writeSettings(R"({"client_info_max": 9})");
  EXPECT_NO_THROW(addItself(5));
}

TEST_F(SelfRegistrationTest, AreCountedInOneEntry) {
  for (int i = 0; i < 20; ++i) addItself(i);
  const auto self = entries().back();
  EXPECT_THAT(self, HasSubstr("Application registered itself[Self 0 "));
  EXPECT_THAT(self, HasSubstr("] (20 times)"));
  EXPECT_EQ(entries().size(), 3U);
}

TEST_F(SelfRegistrationTest, TheirOwnTokensHaveAQuarterOfTheTableTogether) {
  writeSettings(R"({"client_info_max": 100, "token_max": 40})");
  for (int i = 0; i < 45; ++i) {
    const ApplicationId mine = addItself(i).identifier;
    ASSERT_TRUE(grants().tokens.issueToItself({mine}));
    support::Clock::advance(1);
  }
  EXPECT_EQ(rows("oauth_token WHERE flow_type='client_credentials'"), "10");
  EXPECT_TRUE(grants().tokens.issueToItself({frame_}));
  expectOthersUnharmed();
}

TEST_F(SelfRegistrationTest, DoNotWashTheAuditLogOut) {
  writeSettings(R"({"client_info_max": 10, "log_max": 20})");
  for (int i = 0; i < 60; ++i) {
    const ApplicationId mine = addItself(i).identifier;
    const Pair own = *grants().tokens.issueToItself({mine});
    EXPECT_TRUE(grants().tokens.revoke(mine, AnyToken(own.access.text()))->wasThere);
    const Pair pair = login(mine);
    EXPECT_TRUE(grants().tokens.revoke(mine, AnyToken(pair.access.text()))->wasThere);
    login(mine);
    EXPECT_EQ(grants().access.endUserWith(kAlice, mine, Actor("alice")).tokens, 1);
  }
  EXPECT_THAT(entries(), Contains(HasSubstr("registered[Photo Frame")));
  EXPECT_THAT(entries(), Contains(HasSubstr("Access ended of one that registered itself for "
                                            "[alice] by itself[Self 0 ")));
  EXPECT_THAT(entries(), Contains(::testing::EndsWith("] (60 times)")));
  expectOthersUnharmed();
}

}  // namespace
}  // namespace grants_test
