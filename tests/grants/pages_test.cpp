// Parts of long lists: of what people and applications have, and of the
// registry.

#include <string>
#include <vector>

#include "stores/oauth_token.h"
#include "tests/grants/grants_test.h"
#include "utils/oauth_names.h"

namespace grants_test {
namespace {

namespace names = KELDOAUTHSERVER::names;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

class PagesTest : public GrantsTest {
 protected:
  void SetUp() override {
    GrantsTest::SetUp();
    frame_ = add().identifier;
    other_ = add("Other").identifier;
  }
  Sliced<AccessEntry> page(const AccessFilter& filter, const Slice& slice = {}) {
    return grants().access.page(filter, slice);
  }
  long long totalWith(const std::string& contains) {
    AccessFilter filter;
    filter.contains = contains;
    const auto found = page(filter);
    EXPECT_THAT(found.items, SizeIs(static_cast<std::size_t>(found.total)));
    return found.total;
  }
  std::vector<std::string> namesOf(const std::string& contains, const Slice& slice = {}) {
    std::vector<std::string> found;
    for (const Application& application : grants().applications.page(contains, slice).items) {
      found.push_back(application.name.text());
    }
    return found;
  }
  /// Of every kind, dead ones too.
  void fill() {
    CodeRequest brief = request(other_, kBob);
    brief.lifetime = 1;
    grants().codes.issue(brief);
    grants().tokens.issueToItself({other_, {}, {}, 1});
    support::Clock::advance(2);
    for (const char* user : {"alice", "bob", "O'Brien"}) {
      login(frame_, User(user));
      issue(other_, User(user));
    }
    grants().tokens.issueToItself({frame_});
    Json::Value out;
    KELDOAUTHSERVER::OAUTHDBToken(names::kTokenTable)
        .Add("O'Brien", frame_.text(), "profile", "password", "state", "", out);
  }
  static std::vector<std::string> marksOf(const std::vector<AccessEntry>& entries) {
    std::vector<std::string> marks;
    for (const AccessEntry& entry : entries) marks.push_back(entry.handle.mark);
    return marks;
  }

  ApplicationId frame_, other_;
};

// What people and applications have -----------------------------------------------------

TEST_F(PagesTest, PartsMakeTheWholeList) {
  fill();
  for (const bool withAll : {false, true}) {
    AccessFilter filter;
    filter.withDead = filter.withSpent = withAll;
    const auto whole = grants().access.list(filter);
    ASSERT_THAT(whole, SizeIs(withAll ? 13 : 8));
    for (const int most : {1, 3, 50}) {
      std::vector<std::string> marks;
      for (int skipped = 0; skipped < 13; skipped += most) {
        const auto part = page(filter, {most, skipped});
        EXPECT_EQ(part.total, static_cast<long long>(whole.size()));
        for (const std::string& mark : marksOf(part.items)) marks.push_back(mark);
      }
      EXPECT_EQ(marks, marksOf(whole));
    }
  }
}

TEST_F(PagesTest, APartTellsAsMuchAsTheList) {
  fill();
  for (const AccessEntry& entry : page({User("O'Brien")}).items) {
    EXPECT_EQ(entry.user, User("O'Brien"));
    EXPECT_EQ(entry.applicationName,
              ApplicationName(entry.application == frame_ ? "Photo Frame" : "Other"));
  }
  const auto found = page({User("O'Brien")});
  ASSERT_EQ(found.total, 3);
  EXPECT_EQ(found.items[0].kind, AccessEntry::Kind::kCode);
  EXPECT_EQ(found.items[1].kind, AccessEntry::Kind::kLogin);
  EXPECT_EQ(found.items[1].scope, kScope);
  EXPECT_EQ(found.items[1].ends, found.items[1].expires + 30 * kDay);
  EXPECT_TRUE(found.items[2].isForeign);
  EXPECT_EQ(grants().access.end(found.items[1].handle, kAdmin).tokens, 1);
}

TEST_F(PagesTest, BeyondTheEndOnlyTheTotalIsLeft) {
  fill();
  const auto beyond = page({}, {50, 1000});
  EXPECT_THAT(beyond.items, IsEmpty());
  EXPECT_EQ(beyond.total, 8);
  EXPECT_EQ(page({}, {0, 0}).total, 8);
  EXPECT_THAT(page({}, {-1, -1}).items, IsEmpty());
  EXPECT_EQ(page({User("nobody")}).total, 0);
}

TEST_F(PagesTest, APartOfANameFindsIt) {
  fill();
  EXPECT_EQ(totalWith("ALI"), 2);
  EXPECT_EQ(totalWith("'b"), 3);
  EXPECT_EQ(totalWith("photo"), 5);  // the application's
  EXPECT_EQ(totalWith("o"), 8);
  EXPECT_EQ(totalWith("%"), 0);
  EXPECT_EQ(totalWith("application"), 0);  // no user's name
  EXPECT_EQ(totalWith(std::string("a\0", 2)), 0);
}

TEST_F(PagesTest, WhatIsLeftOfARemovedApplicationIsFoundByItsUser) {
  login(frame_);
  sql("DELETE FROM oauth_clientInfo");
  EXPECT_EQ(totalWith("ali"), 1);
  EXPECT_EQ(totalWith("photo"), 0);
  EXPECT_FALSE(page({}).items[0].applicationName);
}

TEST_F(PagesTest, WhatIsDeadIsDeadToTheSecond) {
  Policy policy;
  policy.idle = kHour;
  policy.family = 2 * kHour;
  open(policy);
  const Pair unused = login(frame_, kBob);
  Pair used = login(frame_);
  grants().tokens.issueToItself({frame_});
  AccessFilter everything;
  everything.withDead = true;
  const auto expectLike = [&] {
    long long live = 0;
    for (const AccessEntry& entry : grants().access.list(everything)) live += entry.isDead ? 0 : 1;
    EXPECT_EQ(page({}).total, live);
    for (const AccessEntry& entry : page({}).items) EXPECT_FALSE(entry.isDead);
    return live;
  };
  EXPECT_EQ(expectLike(), 3);
  support::Clock::setTo(kNow + 600);
  EXPECT_EQ(expectLike(), 3);
  support::Clock::advance(1);
  EXPECT_EQ(expectLike(), 2);  // not the application's own any more
  used = refresh(frame_, used);
  support::Clock::setTo(unused.expires + kHour);
  EXPECT_EQ(expectLike(), 2);
  used = refresh(frame_, used);
  support::Clock::advance(1);
  EXPECT_EQ(expectLike(), 1);  // not bob's
  support::Clock::setTo(kNow + kHour + 30 * 60);
  used = refresh(frame_, used);
  support::Clock::setTo(kNow + 2 * kHour);
  EXPECT_EQ(expectLike(), 1);
  support::Clock::advance(1);
  EXPECT_EQ(expectLike(), 0);  // its year is over
}

// The registry ----------------------------------------------------------------------

TEST_F(PagesTest, ApplicationsComeInTheOrderOfTheirNames) {
  add("album");
  add("Zoo");
  add("Album");
  EXPECT_THAT(namesOf(""), ElementsAre("album", "Album", "Other", "Photo Frame", "Zoo"));
  EXPECT_THAT(namesOf("", {2, 1}), ElementsAre("Album", "Other"));
  EXPECT_EQ(grants().applications.page("", {2, 1}).total, 5);
  EXPECT_THAT(namesOf("", {2, 5}), IsEmpty());
  EXPECT_EQ(grants().applications.page("", {2, 5}).total, 5);
}

TEST_F(PagesTest, APartOfItsNameOrItsIdentifierFindsAnApplication) {
  add("It's");
  EXPECT_THAT(namesOf("ot"), ElementsAre("Other", "Photo Frame"));
  EXPECT_THAT(namesOf("FRAME"), ElementsAre("Photo Frame"));
  EXPECT_THAT(namesOf("t's"), ElementsAre("It's"));
  EXPECT_THAT(namesOf("_"), IsEmpty());
  EXPECT_THAT(namesOf(std::string("o\0", 2)), IsEmpty());
  EXPECT_THAT(namesOf(other_.text()), ElementsAre("Other"));
  EXPECT_THAT(namesOf(other_.text().substr(1)), IsEmpty());
}

TEST_F(PagesTest, AnApplicationOfAPageIsWhole) {
  const auto found = grants().applications.page("frame");
  ASSERT_EQ(found.total, 1);
  const Application& frame = found.items[0];
  EXPECT_EQ(frame.identifier, frame_);
  EXPECT_EQ(frame.kind, ApplicationKind::kConfidential);
  EXPECT_TRUE(frame.isEnabled && frame.needsPkce);
  EXPECT_THAT(frame.addresses, ElementsAre(kAddress));
  EXPECT_EQ(frame.scope, kScope);
  EXPECT_EQ(grants().applications.find(frame_)->row, frame.row);
}

TEST_F(PagesTest, ThousandsArePagedWhole) {
  writeSettings(R"({"client_info_max": 1000, "token_max": 10000})");
  sql("WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i+1 FROM n WHERE i<900) "
      "INSERT INTO oauth_clientInfo SELECT enable,substr(client_id||i,-64),client_secret,"
      "redirect_uri,scope,'App '||i,NULL FROM oauth_clientInfo,n WHERE display_name='Other'");
  login(frame_);
  sql("WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i+1 FROM n WHERE i<9999) "
      "INSERT INTO oauth_token SELECT 'user '||i,client_id,scope,refresh_token,"
      "substr('sha256:'||i||access_token,1,64),expired_time,flow_type,state,ip,NULL "
      "FROM oauth_token,n");
  EXPECT_EQ(grants().applications.page("", {50, 850}).total, 902);
  EXPECT_THAT(grants().applications.page("", {50, 850}).items, SizeIs(50));
  EXPECT_EQ(page({}).total, 10000);
  EXPECT_THAT(page({}, {50, 9950}).items, SizeIs(50));
  EXPECT_EQ(totalWith("user 777"), 11);
}

}  // namespace
}  // namespace grants_test
