// Media that are full or cannot be written.

#include <sqlite3.h>

#include <optional>

#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "tests/faults/small_medium.h"
#include "tests/faults/trials.h"
#include "tests/support/case_name.h"
#include "utils/oauth_names.h"

namespace faults {
namespace {

namespace names = KELDOAUTHSERVER::names;
using KELDOAUTHSERVER::OAUTHDBLog;
using KELDOAUTHSERVER::OAUTHDBToken;
using support::id64;
using ::testing::SizeIs;

class MediumTest : public Trials {
 protected:
  void SetUp() override {
    Trials::SetUp();
    medium_.emplace(kStateDir);
    support::Platform::useReadableCipher();
  }

  void TearDown() override {
    medium_.reset();
    Trials::TearDown();
  }

  std::optional<SmallMedium> medium_;
};

// Full ------------------------------------------------------------------------

/// Leaves room for one page less than the number of the occasion.
class FullMedium : public Fault {
 public:
  explicit FullMedium(const SmallMedium& medium) : medium_(medium) {}

  void arm(int nth, bool /*lasting*/) override {
    struck_ = nth <= kMostPages;
    if (struck_) medium_.fill(nth - 1);
  }
  void disarm() override { medium_.empty(); }
  [[nodiscard]] bool struck() const override { return struck_; }
  [[nodiscard]] int code() const override { return SQLITE_FULL; }

 private:
  /// More than any operation needs for its journal and its pages.
  static constexpr int kMostPages = 30;

  const SmallMedium& medium_;
  bool struck_ = false;
};

class FullMediumOperationTest : public MediumTest,
                                public ::testing::WithParamInterface<Operation> {};

TEST_P(FullMediumOperationTest, IsReportedAndLeavesNothingHalfDone) {
  study(GetParam());
  FullMedium full(*medium_);
  throwEverywhere(full);
}

INSTANTIATE_TEST_SUITE_P(EveryWriter, FullMediumOperationTest, ::testing::ValuesIn(everyWriter()),
                         support::CaseName());

class FullMediumTest : public MediumTest {
 protected:
  static int addEntriesUntilRefused(OAUTHDBLog& log) {
    int accepted = 0;
    while (log.Add(std::string(700, 'x')) != 0) ++accepted;
    return accepted;
  }

  static std::string entries() { return sqlText("SELECT count(*) FROM oauth_log"); }
};

TEST_F(FullMediumTest, KeepsEveryEntryThatWasAccepted) {
  OAUTHDBLog log(names::kLogTable);
  const int accepted = addEntriesUntilRefused(log);
  EXPECT_GT(accepted, 50);
  EXPECT_EQ(log.GetErrCode(), SQLITE_FULL);
  EXPECT_EQ(log.GetErrMsg(), "database or disk is full");
  EXPECT_EQ(entries(), std::to_string(accepted));
  EXPECT_EQ(sqlText("PRAGMA integrity_check"), "ok");
  expectPrivate();
}

TEST_F(FullMediumTest, TakesEntriesAgainAsSoonAsThereIsRoom) {
  OAUTHDBLog log(names::kLogTable);
  medium_->fill(8);
  const int accepted = addEntriesUntilRefused(log);
  medium_->empty();
  EXPECT_NE(log.Add("room"), 0);
  EXPECT_EQ(entries(), std::to_string(accepted + 1));
}

TEST_F(FullMediumTest, IsStillReadAndVerifies) {
  furnish(Household::kComplete);
  medium_->fill(0);
  OAUTHDBToken tokens(names::kTokenTable);
  Json::Value rows;
  Json::Value result;
  EXPECT_TRUE(tokens.Get(&rows));
  EXPECT_THAT(rows, SizeIs(4));
  EXPECT_TRUE(tokens.Verify(id64('2'), result));
}

// Read-only -------------------------------------------------------------------

class ReadOnlyMediumTest : public MediumTest {
 protected:
  void TearDown() override {
    medium_->setReadOnly(false);
    MediumTest::TearDown();
  }

  void furnishReadOnly(Household household) {
    furnish(household);
    medium_->setReadOnly(true);
  }
};

class ReadOnlyOperationTest : public ReadOnlyMediumTest,
                              public ::testing::WithParamInterface<Operation> {
 protected:
  void SetUp() override {
    ReadOnlyMediumTest::SetUp();
    study(GetParam());
    reset();
    medium_->setReadOnly(true);
  }
};

class ReadOnlyLookUpTest : public ReadOnlyOperationTest {};

TEST_P(ReadOnlyLookUpTest, AnswersAsEver) {
  const auto store = operation_.open();
  const Answer given = operation_.run(*store);
  EXPECT_TRUE(given.success);
  EXPECT_EQ(given.text, answer_.text);
  EXPECT_EQ(store->GetErrCode(), 255);
}

INSTANTIATE_TEST_SUITE_P(EveryLookUp, ReadOnlyLookUpTest, ::testing::ValuesIn(everyLookUp()),
                         support::CaseName());

class ReadOnlyChangeTest : public ReadOnlyOperationTest {};

TEST_P(ReadOnlyChangeTest, IsRefusedWithSqlitesCode) {
  const auto store = operation_.open();
  EXPECT_FALSE(operation_.run(*store).success);
  EXPECT_EQ(store->GetErrCode(), SQLITE_READONLY);
  EXPECT_EQ(store->GetErrMsg(), "attempt to write a readonly database");
  EXPECT_EQ(indexOf(inspect().state), 0);
}

INSTANTIATE_TEST_SUITE_P(EveryChange, ReadOnlyChangeTest, ::testing::ValuesIn(everyChange()),
                         support::CaseName());

TEST_F(ReadOnlyMediumTest, WithoutAFileSaysThatItCannotBeOpened) {
  furnishReadOnly(Household::kAbsent);
  OAUTHDBToken tokens(names::kTokenTable);
  EXPECT_FALSE(isReady(tokens));
  EXPECT_EQ(tokens.GetErrCode(), SQLITE_CANTOPEN);
  EXPECT_EQ(tokens.GetErrMsg(), "Open DB failed!!");
}

TEST_F(ReadOnlyMediumTest, WithoutATableSaysThatItCannotBeCreated) {
  furnishReadOnly(Household::kWithoutLogTable);
  OAUTHDBToken tokens(names::kTokenTable);
  EXPECT_FALSE(isReady(tokens));
  EXPECT_EQ(tokens.GetErrCode(), -1);
  EXPECT_EQ(tokens.GetErrMsg(), "Create table failed");
}

// What the interrupted transaction wrote cannot be taken back here; so nothing
// is read that was never committed.
TEST_F(ReadOnlyMediumTest, WithAHotJournalIsNotReady) {
  furnishReadOnly(Household::kWithHotJournal);
  OAUTHDBToken tokens(names::kTokenTable);
  Json::Value rows;
  EXPECT_FALSE(isReady(tokens));
  EXPECT_EQ(tokens.GetErrMsg(), "attempt to write a readonly database");
  EXPECT_FALSE(tokens.Get(&rows));
}

}  // namespace
}  // namespace faults
