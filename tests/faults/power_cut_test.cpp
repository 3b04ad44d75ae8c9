// The power fails at every point of every operation. After that the file holds
// the state before the operation or the one after it, and the one after it when
// the operation had reported success.

#include "tests/faults/scene.h"
#include "tests/faults/write_back_disk.h"
#include "tests/support/case_name.h"
#include "tests/support/long_form.h"

namespace faults {
namespace {

using KELDOAUTHSERVER::OAUTHDBBasic;

class PowerCutTest : public Scene, public ::testing::WithParamInterface<Operation> {
 protected:
  void SetUp() override {
    Scene::SetUp();
    study(GetParam());
  }

  /// The power goes at each change of the operation in turn, and once right
  /// after it; `check(state)` judges what is found then. Several times, with
  /// other luck for what was under way.
  template <typename Check>
  void cutEverywhere(Check check) {
    const unsigned seeds = support::isLongForm() ? 250 : 8;
    int cuts = 0;
    for (unsigned seed = 1; seed <= seeds; ++seed) {
      cutDuring_ = true;
      for (int change = 1; cutDuring_ && !HasFailure(); ++change, ++cuts) {
        SCOPED_TRACE("seed " + std::to_string(seed) + ", change " + std::to_string(change));
        cutAt(change, seed);
        check(stateAfterwards());
        expectNextProcessReady();
      }
    }
    RecordProperty("cuts", cuts);
  }

  /// What SQLite does by itself, from now on: it syncs no folder after it has
  /// removed a journal from it.
  void leaveFolderUnsynced() { syncsFolder_ = false; }

  /// The state that is promised: of an operation that had come to its end, and
  /// of one that only had reported its success by then.
  [[nodiscard]] int promised() const {
    if (!cutDuring_) return operation_.units;
    return success_ ? operation_.promised : 0;
  }

 private:
  void cutAt(int change, unsigned seed) {
    reset();
    WriteBackDisk disk(kDatabase, seed);
    const FaultyVfs vfs(disk);
    perform(disk, change);
    cutDuring_ = disk.isOut();
    if (!cutDuring_) disk.cut();
    disk.restoreFiles();
    EXPECT_THAT(vfs.exposed(), ::testing::IsEmpty());
  }

  void perform(WriteBackDisk& disk, int change) {
    std::shared_ptr<OAUTHDBBasic> store;
    if (!operation_.isConstruction()) store = operation_.open();
    if (!syncsFolder_) store->DBCmd("PRAGMA synchronous=FULL", nullptr, nullptr);
    disk.cutAt(change);
    if (operation_.isConstruction()) {
      store = operation_.open();
      success_ = isReady(*store);
    } else {
      success_ = operation_.run(*store).success;
    }
  }

  /// -1 when it is none of the operation's.
  int stateAfterwards() {
    const Inspection found = inspect();
    EXPECT_EQ(found.integrity, "ok|\n");
    return indexOf(found.state);
  }

  void expectNextProcessReady() {
    const auto store = operation_.open();
    EXPECT_TRUE(isReady(*store));
    expectNoHotJournal();
    expectPrivate();
  }

  bool syncsFolder_ = true;
  bool cutDuring_ = false;
  bool success_ = false;
};

TEST_P(PowerCutTest, LeavesTheOldStateOrTheNewOne) {
  cutEverywhere([this](int state) { EXPECT_GE(state, promised()); });
}

/// The same medium takes acknowledged changes back where the folder is not
/// synced: it is what start-up sets that keeps them.
using PowerCutControlTest = PowerCutTest;

TEST_P(PowerCutControlTest, LosesWhatWasAcknowledgedWithoutTheFoldersSync) {
  leaveFolderUnsynced();
  int lost = 0;
  cutEverywhere([&](int state) {
    EXPECT_GE(state, 0);
    if (state < promised()) ++lost;
  });
  EXPECT_GT(lost, 0);
  RecordProperty("lost", lost);
}

INSTANTIATE_TEST_SUITE_P(EveryWriter, PowerCutTest, ::testing::ValuesIn(everyWriter()),
                         support::CaseName());

INSTANTIATE_TEST_SUITE_P(EveryChange, PowerCutControlTest, ::testing::ValuesIn(everyChange()),
                         support::CaseName());

}  // namespace
}  // namespace faults
