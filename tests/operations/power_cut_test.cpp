// The power fails right after backup, restore, rekey or the first registration
// has said that it is done, on ext4 (see tests/faults/ext4_medium.h).

#include <filesystem>
#include <optional>

#include "tests/faults/ext4_medium.h"
#include "tests/operations/operations_test.h"
#include "tests/support/long_form.h"

namespace operations {
namespace {

namespace fs = std::filesystem;
using faults::Ext4Medium;

class PowerCut : public Operations {
 protected:
  void SetUp() override {
    Operations::SetUp();
    const std::string obstacle = Ext4Medium::obstacle();
    if (!obstacle.empty()) GTEST_SKIP() << "no ext4 of our own here: " << obstacle;
    fs::create_directory(kCopies);
    state_.emplace(kStateDir, "/tmp/state");
    copies_.emplace(kCopies, "/tmp/copies-medium");
    furnish();
  }

  void TearDown() override {
    copies_.reset();
    state_.reset();
    Operations::TearDown();
  }

  /// What was there before is on the disk; then `command` runs to its end, and
  /// the power goes.
  void cutAfter(const Arguments& command) {
    state_->settle();
    copies_->settle();
    const Outcome outcome = run(command);
    state_->cut();
    copies_->cut();
    EXPECT_THAT(outcome, ExitsWith(cli::kOk));
    state_->restart();
    copies_->restart();
  }

  /// `round()` once, or in the long form many times.
  template <typename Round>
  void again(Round round) {
    const int rounds = support::isLongForm() ? 100 : 2;
    for (int nth = 0; nth < rounds && !HasFailure(); ++nth) round();
    RecordProperty("cuts", rounds);
  }

  static std::string key() { return readFile(kKey); }

 private:
  std::optional<Ext4Medium> state_;
  std::optional<Ext4Medium> copies_;
};

/// Database and key are made within it.
TEST_F(PowerCut, FindsTheFirstApplication) {
  again([this] {
    for (const char* path : {kDatabase, kKey}) ASSERT_TRUE(fs::remove(path));
    cutAfter({"client", "add", "--redirect-uri", "app:/back", "--scope", "read", "--name", "One"});
    const Json::Value clients = json({"client", "list"})["clients"];
    ASSERT_EQ(clients.size(), 1U);
    EXPECT_EQ(clients[0]["client_id"].asString().size(), 64U);
    expectPrivate(kStateDir);
  });
}

TEST_F(PowerCut, FindsTheFinishedBackup) {
  again([this] {
    const Content content = contentOf();
    cutAfter({"backup", kCopy});
    EXPECT_EQ(contentOf(kCopy), content);
    expectPrivate(kCopies);
    fs::remove(kCopy);
  });
}

TEST_F(PowerCut, FindsTheFinishedRestore) {
  const Content content = contentOf();
  ASSERT_THAT(backUp(), ExitsWith(cli::kOk));
  again([&] {
    furnish("second");
    ASSERT_NE(contentOf(), content);
    cutAfter({"restore", "--yes", kCopy});
    EXPECT_EQ(contentOf(), content);
    expectNextProgramReady();
  });
}

TEST_F(PowerCut, FindsTheFinishedChangeOfTheKey) {
  const std::string clients = run({"client", "list"}).out;
  again([&] {
    const std::string before = key();
    cutAfter({"rekey", "--yes"});
    EXPECT_NE(key(), before);
    EXPECT_EQ(run({"client", "list"}).out, clients);
    EXPECT_FALSE(fs::exists(kNextKey));
    expectPrivate(kStateDir);
  });
}

}  // namespace
}  // namespace operations
