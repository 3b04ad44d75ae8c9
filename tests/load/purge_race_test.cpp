// Several purges at once: together they remove what has expired and nothing
// else. A purge that finds a row gone which it was about to remove says so.

#include <atomic>

#include "stores/oauth_grantCode.h"
#include "stores/oauth_token.h"
#include "tests/load/processes.h"
#include "tests/support/long_form.h"
#include "tests/support/world.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace load {
namespace {

namespace names = KELDOAUTHSERVER::names;
using KELDOAUTHSERVER::getRandomStr;
using KELDOAUTHSERVER::OAUTHDBGrantCode;
using KELDOAUTHSERVER::OAUTHDBToken;

constexpr int kProcesses = 8;
constexpr int kRowsOfEachKind = 25;

struct Count {
  Barrier start{kProcesses};
  std::atomic<int> successes{0};
  std::atomic<int> silentFailures{0};
};

class PurgeRaceTest : public support::World {
 protected:
  void purgeAtOnce(const std::function<void()>& check) {
    const int rounds = support::isLongForm() ? 500 : 20;
    EXPECT_TRUE(hold({kProcesses, rounds, [this] { furnish(); }, [this](int) { purge(); }, check}));
    RecordProperty("rounds", rounds);
  }

  Shared<Count> count_;

 private:
  void furnish() {
    SetUp();
    count_->successes = count_->silentFailures = 0;
    for (int row = 0; row < kRowsOfEachKind; ++row) {
      add("1");
      add("4000000000");
    }
  }

  static void add(const std::string& expiry) {
    const std::string client = support::id64('c');
    Json::Value out;
    EXPECT_TRUE(OAUTHDBGrantCode(names::kGrantCodeTable)
                    .Add("alice", client, "read", getRandomStr(64), expiry, "state", "", out));
    EXPECT_TRUE(OAUTHDBToken(names::kTokenTable)
                    .Add("alice", client, "read", getRandomStr(64), getRandomStr(64), expiry,
                         "code", "state", "", out));
  }

  void purge() {
    OAUTHDBGrantCode codes(names::kGrantCodeTable);
    OAUTHDBToken tokens(names::kTokenTable);
    count_->start.wait();
    note(codes.Purge() != 0, codes);
    count_->start.wait();
    note(tokens.Purge(), tokens);
  }

  void note(bool success, const KELDOAUTHSERVER::OAUTHDBBasic& store) {
    if (success) {
      ++count_->successes;
    } else if (store.GetErrCode() == 255) {
      ++count_->silentFailures;
    }
  }
};

TEST_F(PurgeRaceTest, RemovesWhatExpiredAndNothingElse) {
  purgeAtOnce([] {
    for (const std::string table : {names::kGrantCodeTable, names::kTokenTable}) {
      EXPECT_EQ(sqlText("SELECT count(*) FROM " + table), std::to_string(kRowsOfEachKind));
      EXPECT_EQ(sqlText("SELECT count(*) FROM " + table + " WHERE expired_time = '1'"), "0");
    }
  });
}

TEST_F(PurgeRaceTest, SucceedsOrSaysThatARowWasGone) {
  int overtaken = 0;
  purgeAtOnce([&] {
    EXPECT_GE(count_->successes, 2);  // the first of each table
    EXPECT_EQ(count_->successes + count_->silentFailures, 2 * kProcesses);
    overtaken += count_->silentFailures;
  });
  RecordProperty("overtaken", overtaken);
}

}  // namespace
}  // namespace load
