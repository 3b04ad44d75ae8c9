// Stores over a file that is no database, or cannot be opened at all: what each
// operation answers, and that none of them does anything.

#include <gmock/gmock.h>
#include <json/value.h>
#include <sys/stat.h>

#include <functional>
#include <ostream>
#include <string>

#include "tests/stores/text_operations.h"

using namespace KELDOAUTHSERVER;
using support::id64;
using ::testing::Contains;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

namespace {

constexpr char kNotReady[] = "oauth_db_basic DB is not ready!!";

/// The database file is a folder.
class NotReadyTest : public support::World {
 protected:
  void SetUp() override {
    World::SetUp();
    support::Platform::useReadableCipher();
    Statements::watch();
    ASSERT_EQ(mkdir(kDatabase, 0700), 0);
  }
};

TEST_F(NotReadyTest, ObjectSaysWhy) {
  const OAUTHDBToken store(names::kTokenTable);
  EXPECT_EQ(store.GetErrCode(), 14);
  EXPECT_EQ(store.GetErrMsg(), "Open DB failed!!");
  EXPECT_EQ(store.GetTabName(), "oauth_token");
  EXPECT_THAT(journal(), ElementsAre("oauth_db_basic Open DB failed!![14]"));
}

TEST_F(NotReadyTest, LaterRepairDoesNotHelp) {
  OAUTHDBToken store(names::kTokenTable);
  rmdir(kDatabase);
  Json::Value rows;
  EXPECT_FALSE(store.Get(&rows));
}

TEST_F(NotReadyTest, VerifyTellsTheErrorOfTheOpening) {
  OAUTHDBToken store(names::kTokenTable);
  Json::Value result;
  EXPECT_FALSE(store.Verify(id64('a'), result));
  EXPECT_EQ(result["err_code"].asInt(), 14);
  EXPECT_EQ(result["err_msg"].asString(), "Open DB failed!!");
}

TEST_F(NotReadyTest, PurgeHasNothingToDo) {
  for (const Aftermath& outcome : {onCodes([](auto& store) { return store.Purge(); }),
                                   onTokens([](auto& store) { return store.Purge(); })}) {
    EXPECT_TRUE(succeeded(outcome));
    EXPECT_THAT(outcome.lines, Contains(kNotReady));
  }
}

/// A registration opens a log of its own, which is not ready either.
TEST_F(NotReadyTest, RegistrationReadsAsFull) {
  const Aftermath outcome = addClient();
  EXPECT_TRUE(failed(outcome, -5, "ClientInfo Table is full"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Open DB failed!![14]", kNotReady,
                                         "oauth_db_basic Get Row Count failed[oauth_clientInfo]",
                                         "oauth_db_basic Check Row Max failed[oauth_clientInfo]",
                                         "oauth_clientInfo:63 ClientInfo Table is full"));
}

TEST_F(NotReadyTest, IssuingReadsAsFull) {
  EXPECT_TRUE(failed(addCode(), -5, "GrantCode Table is full"));
  EXPECT_TRUE(failed(addToken(), -5, "Token Table is full"));
}

TEST_F(NotReadyTest, LogAnswersNoMessage) {
  const Aftermath outcome = onLog([](auto& store) { return store.Add("hello"); });
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines,
              ElementsAre(kNotReady, "oauth_db_basic Add failed[oauth_log]", kNotReady));
}

// Everything that neither inserts nor purges fails with nothing but its lines.

struct RefusedCase {
  const char* name;
  std::function<Aftermath()> run;
  const char* line;
};
void PrintTo(const RefusedCase& c, std::ostream* out) {
  *out << c.name;
}

class RefusedTest : public NotReadyTest, public ::testing::WithParamInterface<RefusedCase> {};

TEST_P(RefusedTest, FailsWithoutACode) {
  const Aftermath outcome = GetParam().run();
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines, ElementsAre(kNotReady, GetParam().line));
  EXPECT_THAT(outcome.statements, IsEmpty());
}

constexpr char kClientEdit[] = "oauth_db_basic Edit failed[oauth_clientInfo]";
constexpr char kClientDelete[] = "oauth_db_basic Delete failed[oauth_clientInfo]";
constexpr char kClientGet[] = "oauth_db_basic Get failed[oauth_clientInfo]";
constexpr char kCodeEdit[] = "oauth_db_basic Edit failed[oauth_grantCode]";
constexpr char kCodeDelete[] = "oauth_db_basic Delete failed[oauth_grantCode]";
constexpr char kCodeGet[] = "oauth_db_basic Get failed[oauth_grantCode]";
constexpr char kTokenEdit[] = "oauth_db_basic Edit failed[oauth_token]";
constexpr char kTokenDelete[] = "oauth_db_basic Delete failed[oauth_token]";
constexpr char kTokenGet[] = "oauth_db_basic Get failed[oauth_token]";

Json::Value unused;

const RefusedCase kRefused[] = {
    {"ClientEdit", [] { return editClient(1); }, kClientEdit},
    {"ClientEnable", [] { return onClients([](auto& s) { return s.Enable(1); }); }, kClientEdit},
    {"ClientDisable", [] { return onClients([](auto& s) { return s.Disable(1); }); }, kClientEdit},
    {"ClientDel", [] { return onClients([](auto& s) { return s.Del(1); }); }, kClientDelete},
    {"ClientGet", [] { return onClients([](auto& s) { return s.Get(id64('c'), &unused); }); },
     kClientGet},
    {"ClientGetIndex", [] { return onClients([](auto& s) { return s.GetIndex(id64('c')); }); },
     kClientGet},
    {"ClientGetAll", [] { return onClients([](auto& s) { return s.Get(&unused); }); }, kClientGet},
    {"CodeEdit", [] { return editCode(1); }, kCodeEdit},
    {"CodeEditAndExpiry", [] { return editCodeAndExpiry(1); }, kCodeEdit},
    {"CodeRevoke", [] { return onCodes([](auto& s) { return s.Revoke(1); }); }, kCodeEdit},
    {"CodeDel", [] { return onCodes([](auto& s) { return s.Del(1); }); }, kCodeDelete},
    {"CodeGet", [] { return onCodes([](auto& s) { return s.Get(id64('g'), &unused); }); },
     kCodeGet},
    {"CodeGetIndex", [] { return onCodes([](auto& s) { return s.GetIndex(id64('g')); }); },
     kCodeGet},
    {"TokenEdit", [] { return editToken(1); }, kTokenEdit},
    {"TokenEditAndExpiry", [] { return editTokenAndExpiry(1); }, kTokenEdit},
    {"TokenRevoke", [] { return onTokens([](auto& s) { return s.Revoke(1); }); }, kTokenDelete},
    {"TokenDel", [] { return onTokens([](auto& s) { return s.Del(1); }); }, kTokenDelete},
    {"TokenGetById", [] { return onTokens([](auto& s) { return s.Get(1LL, &unused); }); },
     kTokenGet},
    {"TokenGetIndex", [] { return onTokens([](auto& s) { return s.GetIndex(id64('a')); }); },
     kTokenGet},
    {"TokenGetWithRefreshToken",
     [] { return onTokens([](auto& s) { return s.GetWithRefreshToken(id64('r'), &unused); }); },
     kTokenGet},
    {"LogGet", [] { return onLog([](auto& s) { return s.Get("", "", &unused); }); },
     "oauth_db_basic Get failed[oauth_log]"},
    {"LogDel", [] { return onLog([](auto& s) { return s.Del(); }); },
     "oauth_db_basic Delete failed[oauth_log]"},
};

INSTANTIATE_TEST_SUITE_P(Stores, RefusedTest, ::testing::ValuesIn(kRefused),
                         ::testing::PrintToStringParamName());

/// Bad arguments are found before it shows that the object is not ready, except
/// where rows are counted first.
using NotReadyOrderTest = NotReadyTest;

TEST_F(NotReadyOrderTest, BadArgumentsOfChangesAndLookUpsComeFirst) {
  for (const Operation& operation : operations()) {
    if (operation.row == "3") continue;  // adds a row
    Json::Value out;
    const Aftermath outcome = operation.run({{operation.arguments.front().name, ""}}, out);
    EXPECT_TRUE(failed(outcome, operation.refusalCode, operation.refusalMessage()));
    EXPECT_THAT(outcome.lines, ElementsAre(operation.refusal)) << operation.name;
  }
}

}  // namespace
