// Many processes race for a database file that is not there yet.

#include <atomic>

#include "stores/oauth_log.h"
#include "tests/load/processes.h"
#include "tests/support/long_form.h"
#include "tests/support/world.h"
#include "utils/oauth_names.h"

namespace load {
namespace {

namespace names = KELDOAUTHSERVER::names;
using support::Row;
using ::testing::ElementsAre;

constexpr int kProcesses = 16;

struct Count {
  std::atomic<int> ready{0};
  std::atomic<int> withoutError{0};
};

class FirstConstructionTest : public support::World {
 protected:
  void constructAtOnce(const std::function<void()>& check) {
    const int rounds = support::isLongForm() ? 1000 : 50;
    const auto startOver = [this] {
      SetUp();  // an empty folder
      count_->ready = count_->withoutError = 0;
    };
    EXPECT_TRUE(hold({kProcesses, rounds, startOver, [this](int) { construct(); }, check}));
    RecordProperty("races", rounds);
  }

  Shared<Count> count_;

 private:
  void construct() {
    KELDOAUTHSERVER::OAUTHDBLog log(names::kLogTable);
    Json::Value rows;
    if (log.DBGetRowCount(rows) != 0) ++count_->ready;
    if (log.GetErrCode() == 255) ++count_->withoutError;
  }
};

TEST_F(FirstConstructionTest, EveryProcessFindsItsObjectReady) {
  constructAtOnce([this] {
    EXPECT_EQ(count_->ready, kProcesses);
    EXPECT_EQ(count_->withoutError, kProcesses);
  });
}

TEST_F(FirstConstructionTest, EveryTableIsThere) {
  constructAtOnce([] {
    EXPECT_THAT(sql("SELECT name FROM sqlite_master WHERE type = 'table' ORDER BY name"),
                ElementsAre(Row{{"name", names::kClientInfoTable}},
                            Row{{"name", names::kGrantCodeTable}}, Row{{"name", names::kLogTable}},
                            Row{{"name", names::kMetaTable}}, Row{{"name", names::kTokenTable}}));
    EXPECT_EQ(sqlText("PRAGMA integrity_check"), "ok");
  });
}

/// Whoever finds no meta table fills it, so that it may hold its rows more than
/// once; nothing reads them.
TEST_F(FirstConstructionTest, MetaTableNamesEveryVersion) {
  int filledMoreThanOnce = 0;
  constructAtOnce([&] {
    EXPECT_THAT(sql("SELECT DISTINCT tab_name, version FROM oauth_meta ORDER BY tab_name"),
                ElementsAre(Row{{"tab_name", names::kClientInfoTable}, {"version", "2"}},
                            Row{{"tab_name", names::kGrantCodeTable}, {"version", "2"}},
                            Row{{"tab_name", names::kTokenTable}, {"version", "2"}}));
    if (sqlText("SELECT count(*) FROM oauth_meta") != "3") ++filledMoreThanOnce;
  });
  RecordProperty("filled_more_than_once", filledMoreThanOnce);
}

}  // namespace
}  // namespace load
