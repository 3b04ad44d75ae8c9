// Stores on the connection of another: what the second constructor does, and
// above all what it leaves alone.

#include <gmock/gmock.h>
#include <json/value.h>
#include <sys/stat.h>

#include <filesystem>
#include <functional>
#include <memory>
#include <ostream>
#include <string>

#include "tests/stores/text_operations.h"

using namespace KELDOAUTHSERVER;
using support::FakeIds;
using support::id64;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

namespace {

/// One of the four stores, by itself or on another's connection.
struct Kind {
  const char* name;
  const char* table;
  std::function<std::shared_ptr<OAUTHDBBasic>()> open;
  std::function<std::shared_ptr<OAUTHDBBasic>(OAUTHDBBasic& store)> lend;
};
void PrintTo(const Kind& kind, std::ostream* out) {
  *out << kind.name;
}

template <typename Store>
Kind kindOf(const char* name, const char* table) {
  return {name, table, [table] { return std::make_shared<Store>(table); },
          [table](OAUTHDBBasic& store) { return std::make_shared<Store>(table, store); }};
}

const Kind kKinds[] = {
    kindOf<OAUTHDBClientInfo>("Clients", names::kClientInfoTable),
    kindOf<OAUTHDBGrantCode>("Codes", names::kGrantCodeTable),
    kindOf<OAUTHDBToken>("Tokens", names::kTokenTable),
    kindOf<OAUTHDBLog>("Log", names::kLogTable),
};

class LentTest : public StoreTest, public ::testing::WithParamInterface<Kind> {
 protected:
  /// How many descriptors of the database file this process holds.
  static int descriptors() {
    int found = 0;
    for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
      std::error_code gone;
      if (std::filesystem::read_symlink(entry.path(), gone) == kDatabase) ++found;
    }
    return found;
  }

  static bool isReady(OAUTHDBBasic& store) {
    return store.DBCmd("SELECT 1;", nullptr, nullptr) != 0;
  }

  /// Makes the next DBInit of an owner fail, and that of a borrower, too, if it
  /// did anything.
  static void blockLogTable() {
    sql("ALTER TABLE oauth_log RENAME TO old_log; CREATE INDEX oauth_log ON old_log(msg);");
  }
  static void unblockLogTable() { sql("DROP INDEX oauth_log;"); }
};

// Construction ----------------------------------------------------------------

TEST_P(LentTest, OpensNothingAndRunsNothing) {
  OAUTHDBToken owner(names::kTokenTable);
  const int before = descriptors();
  const Lines settled = Statements::texts();
  Statements::clear();
  {
    const auto lent = GetParam().lend(owner);
    EXPECT_EQ(descriptors(), before);
    EXPECT_EQ(lent->GetTabName(), GetParam().table);
  }
  EXPECT_EQ(descriptors(), before);
  EXPECT_THAT(Statements::texts(), IsEmpty());
  EXPECT_FALSE(settled.empty());  // what an owner's construction looks like
}

TEST_P(LentTest, IsConstructedAndGoesWithoutALineAtEveryLevel) {
  withDiagnostics(-1, [] {
    OAUTHDBToken owner(names::kTokenTable);
    SystemLog::clear();
    { const auto lent = GetParam().lend(owner); }
    EXPECT_THAT(journal(), IsEmpty());
  });
}

TEST_P(LentTest, SwitchesNoPrivilege) {
  FakeIds::use(1000, 1000);
  OAUTHDBToken owner(names::kTokenTable);
  const auto before = FakeIds::calls();
  EXPECT_FALSE(before.empty());
  { const auto lent = GetParam().lend(owner); }
  EXPECT_EQ(FakeIds::calls(), before);
}

TEST_P(LentTest, CreatesNoTableThatIsMissing) {
  OAUTHDBToken owner(names::kTokenTable);
  sql(std::string("DROP TABLE ") + GetParam().table + ";");
  const auto lent = GetParam().lend(owner);
  EXPECT_NE(lent->DBInit(), 0);
  EXPECT_EQ(sqlText("SELECT count(*) FROM sqlite_master WHERE name='" +
                    std::string(GetParam().table) + "';"),
            "0");
}

TEST_P(LentTest, SeesAndWritesWhatTheOwnerDoes) {
  const auto owner = GetParam().open();
  const auto lent = GetParam().lend(*owner);
  owner->DBCmd("BEGIN;", nullptr, nullptr);
  owner->DBCmd(insertionOfLog(), nullptr, nullptr);
  Json::Value counts;
  OAUTHDBLog log(names::kLogTable, *lent);
  EXPECT_NE(log.DBGetRowCount(counts), 0);
  EXPECT_EQ(counts[0].asString(), "1");
  EXPECT_EQ(rowCount("oauth_log"), 0);  // another connection
  owner->DBCmd("COMMIT;", nullptr, nullptr);
}

// Readiness -------------------------------------------------------------------

TEST_P(LentTest, IsReadyWithTheOwner) {
  OAUTHDBToken owner(names::kTokenTable);
  const auto lent = GetParam().lend(owner);
  EXPECT_TRUE(isReady(*lent));
  EXPECT_EQ(lent->GetErrCode(), 255);
  EXPECT_EQ(lent->GetErrMsg(), "");
}

TEST_P(LentTest, IsNotReadyWithAnOwnerThatIsNot) {
  blockLogTable();
  OAUTHDBToken owner(names::kTokenTable);
  ASSERT_EQ(owner.GetErrCode(), -1);
  const auto lent = GetParam().lend(owner);
  SystemLog::clear();
  EXPECT_FALSE(isReady(*lent));
  EXPECT_EQ(lent->GetErrCode(), 255);
  EXPECT_EQ(lent->GetErrMsg(), "");
  EXPECT_THAT(journal(), ElementsAre("oauth_db_basic DB is not ready!!"));
}

TEST_P(LentTest, StaysReadyWhenTheOwnerNoLongerIs) {
  OAUTHDBToken owner(names::kTokenTable);
  const auto lent = GetParam().lend(owner);
  blockLogTable();
  ASSERT_EQ(owner.DBInit(), 0);
  EXPECT_TRUE(isReady(*lent));
  EXPECT_EQ(lent->DBInit(), 0);
  EXPECT_FALSE(isReady(*lent));
}

TEST_P(LentTest, StaysNotReadyUntilItsInitAsksAgain) {
  blockLogTable();
  OAUTHDBToken owner(names::kTokenTable);
  const auto lent = GetParam().lend(owner);
  unblockLogTable();
  ASSERT_EQ(owner.DBInit(), 1);
  EXPECT_FALSE(isReady(*lent));
  Statements::clear();
  EXPECT_EQ(lent->DBInit(), 1);
  EXPECT_THAT(Statements::texts(), IsEmpty());
  EXPECT_TRUE(isReady(*lent));
}

TEST_P(LentTest, InitWritesNoTrace) {
  withDiagnostics(-1, [] {
    OAUTHDBToken owner(names::kTokenTable);
    const auto lent = GetParam().lend(owner);
    SystemLog::clear();
    EXPECT_EQ(lent->DBInit(), 1);
    EXPECT_THAT(journal(), IsEmpty());
  });
}

TEST_P(LentTest, HasNoConnectionOnAnOwnerWithout) {
  std::filesystem::remove(kDatabase);
  ASSERT_EQ(mkdir(kDatabase, 0700), 0);
  OAUTHDBToken owner(names::kTokenTable);
  ASSERT_EQ(owner.GetErrCode(), 14);
  const auto lent = GetParam().lend(owner);
  EXPECT_EQ(lent->GetErrCode(), 255);
  EXPECT_EQ(lent->DBInit(), 0);
  EXPECT_FALSE(isReady(*lent));
  EXPECT_EQ(lent->GetErrCode(), 255);
  EXPECT_EQ(lent->DBDrop(), 0);
  EXPECT_EQ(lent->GetErrCode(), 21);  // of SQLite without a connection
  EXPECT_EQ(lent->GetErrMsg(), "bad parameter or other API misuse");
}

// Chains and lives ------------------------------------------------------------

TEST_P(LentTest, CanLendOn) {
  OAUTHDBToken owner(names::kTokenTable);
  const int before = descriptors();
  const auto first = GetParam().lend(owner);
  const auto second = GetParam().lend(*first);
  const auto third = GetParam().lend(*second);
  EXPECT_EQ(descriptors(), before);
  EXPECT_TRUE(isReady(*third));
  blockLogTable();
  owner.DBInit();
  EXPECT_EQ(third->DBInit(), 1);  // the one that lends is still ready
  EXPECT_EQ(first->DBInit(), 0);
  EXPECT_EQ(second->DBInit(), 0);
  EXPECT_EQ(third->DBInit(), 0);
}

TEST_P(LentTest, LeavesTheConnectionOpenWhenItGoes) {
  OAUTHDBToken owner(names::kTokenTable);
  const auto other = GetParam().lend(owner);
  { const auto lent = GetParam().lend(*other); }
  EXPECT_TRUE(isReady(*other));
  EXPECT_TRUE(isReady(owner));
}

TEST_P(LentTest, TransactionOutlivesTheBorrowerThatBeganIt) {
  OAUTHDBToken owner(names::kTokenTable);
  {
    const auto lent = GetParam().lend(owner);
    lent->DBCmd("BEGIN; " + insertionOfLog(), nullptr, nullptr);
  }
  EXPECT_EQ(rowCount("oauth_log"), 0);
  EXPECT_NE(owner.DBCmd("COMMIT;", nullptr, nullptr), 0);
  EXPECT_EQ(rowCount("oauth_log"), 1);
}

TEST_P(LentTest, ConnectionIsClosedWithTheOwnerOnceAndForAll) {
  const int before = descriptors();
  auto owner = GetParam().open();
  EXPECT_EQ(descriptors(), before + 1);
  const auto lent = GetParam().lend(*owner);
  { const auto other = GetParam().lend(*lent); }
  owner.reset();
  EXPECT_EQ(descriptors(), before);
  EXPECT_THAT(journal(), IsEmpty());
}  // a borrower that only goes after it touches nothing

// Errors ----------------------------------------------------------------------

TEST_P(LentTest, ErrorsOfBorrowerAndOwnerAreApart) {
  OAUTHDBToken owner(names::kTokenTable);
  owner.DBCmd("nonsense", nullptr, nullptr);
  const auto lent = GetParam().lend(owner);
  EXPECT_EQ(lent->GetErrCode(), 255);
  EXPECT_EQ(lent->GetErrMsg(), "");
  lent->DBCmd("SELECT * FROM nowhere;", nullptr, nullptr);
  EXPECT_EQ(owner.GetErrMsg(), "near \"nonsense\": syntax error");
  EXPECT_EQ(lent->GetErrMsg(), "no such table: nowhere");
  owner.SetErrCode(5);
  owner.SetErrMsg("other");
  EXPECT_EQ(lent->GetErrCode(), 1);
  EXPECT_EQ(lent->GetErrMsg(), "no such table: nowhere");
}

// Tables ----------------------------------------------------------------------

TEST_P(LentTest, TableNamesOfBorrowerAndOwnerAreApart) {
  OAUTHDBToken owner(names::kTokenTable);
  const auto lent = GetParam().lend(owner);
  lent->SetTabName("elsewhere");
  EXPECT_EQ(owner.GetTabName(), "oauth_token");
  owner.SetTabName("nowhere");
  EXPECT_EQ(lent->GetTabName(), "elsewhere");
}

TEST_P(LentTest, DropsItsTableOnTheCommonConnection) {
  OAUTHDBToken owner(names::kTokenTable);
  const auto lent = GetParam().lend(owner);
  owner.DBCmd("BEGIN;", nullptr, nullptr);
  EXPECT_EQ(lent->DBDrop(), 1);
  owner.DBCmd("ROLLBACK;", nullptr, nullptr);
  EXPECT_EQ(rowCount(GetParam().table), 0);  // it is back
  EXPECT_EQ(lent->DBDrop(), 1);
  EXPECT_EQ(sqlText("SELECT count(*) FROM sqlite_master WHERE name='" +
                    std::string(GetParam().table) + "';"),
            "0");
  EXPECT_EQ(owner.DBInit(), 1);  // and is created again by who owns the connection
  EXPECT_EQ(rowCount(GetParam().table), 0);
}

INSTANTIATE_TEST_SUITE_P(On, LentTest, ::testing::ValuesIn(kKinds),
                         ::testing::PrintToStringParamName());

}  // namespace
