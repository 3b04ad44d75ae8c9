// The power fails right after an operation has reported success, on a real file
// system: after its restart ext4 has what was acknowledged.

#include <algorithm>
#include <optional>
#include <vector>

#include "tests/faults/ext4_medium.h"
#include "tests/faults/scene.h"
#include "tests/support/case_name.h"
#include "tests/support/long_form.h"

namespace faults {
namespace {

using KELDOAUTHSERVER::OAUTHDBBasic;

class Ext4Test : public Scene, public ::testing::WithParamInterface<Operation> {
 protected:
  void SetUp() override {
    Scene::SetUp();
    const std::string obstacle = Ext4Medium::obstacle();
    if (!obstacle.empty()) GTEST_SKIP() << "no ext4 of our own here: " << obstacle;
    medium_.emplace(kStateDir, "/tmp/medium");
    study(GetParam());
  }

  void TearDown() override {
    medium_.reset();
    Scene::TearDown();
  }

  static int rounds() { return support::isLongForm() ? 100 : 1; }

  /// The place of the state that the machine comes back with among those of the
  /// operation, which has come to its end.
  int stateAfterACut() {
    reset();
    medium_->settle();
    perform();
    medium_->restart();
    const Inspection found = inspect();
    EXPECT_EQ(found.integrity, "ok|\n");
    return indexOf(found.state);
  }

  void leaveFolderUnsynced() { syncsFolder_ = false; }

 private:
  void perform() {
    const std::shared_ptr<OAUTHDBBasic> store = operation_.open();
    EXPECT_TRUE(isReady(*store));
    if (!syncsFolder_) store->DBCmd("PRAGMA synchronous=FULL", nullptr, nullptr);
    EXPECT_TRUE(operation_.isConstruction() || operation_.run(*store).success);
    medium_->cut();
  }

  bool syncsFolder_ = true;
  std::optional<Ext4Medium> medium_;
};

TEST_P(Ext4Test, HasWhatWasAcknowledged) {
  for (int round = 0; round < rounds() && !HasFailure(); ++round) {
    EXPECT_EQ(stateAfterACut(), operation_.units);
    EXPECT_TRUE(isReady(*operation_.open()));
    expectNoHotJournal();
    expectPrivate();
  }
  RecordProperty("cuts", rounds());
}

INSTANTIATE_TEST_SUITE_P(EveryOperation, Ext4Test, ::testing::ValuesIn(everyOperation()),
                         support::CaseName());

/// The same cut takes the change back where the folder is not synced, so that
/// it is no kindness of this file system that keeps it.
using Ext4ControlTest = Ext4Test;

/// A registration ends with an entry through a connection of its own, which
/// syncs the folder for both.
std::vector<Operation> everyChangeOfOneConnection() {
  std::vector<Operation> changes = everyChange();
  const auto hasTwo = [](const Operation& operation) {
    return operation.promised < operation.units;
  };
  changes.erase(std::remove_if(changes.begin(), changes.end(), hasTwo), changes.end());
  return changes;
}

TEST_P(Ext4ControlTest, LosesWhatWasAcknowledgedWithoutTheFoldersSync) {
  leaveFolderUnsynced();
  int lost = 0;
  for (int round = 0; round < rounds() && !HasFailure(); ++round) {
    const int state = stateAfterACut();
    EXPECT_GE(state, 0);
    if (state < operation_.units) ++lost;
  }
  EXPECT_GT(lost, 0);
  RecordProperty("cuts", rounds());
  RecordProperty("lost", lost);
}

INSTANTIATE_TEST_SUITE_P(EveryChange, Ext4ControlTest,
                         ::testing::ValuesIn(everyChangeOfOneConnection()), support::CaseName());

}  // namespace
}  // namespace faults
