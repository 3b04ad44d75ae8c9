// The folder cannot be synced, after the journal has gone from it.

#include <sqlite3.h>

#include "tests/faults/faulty_vfs.h"
#include "tests/faults/scene.h"
#include "tests/support/case_name.h"

namespace faults {
namespace {

/// Removes what it is asked to, and then fails to sync the folder.
class UnsyncedFolder : public Medium {
 public:
  int permit(Call /*call*/) override { return SQLITE_OK; }

  int removed(const std::string& path, bool folder) override {
    if (path.empty() || !folder || !fails_) return SQLITE_OK;
    ++failures_;
    return SQLITE_IOERR_DIR_FSYNC;
  }

  void setFailing(bool fails) { fails_ = fails; }
  [[nodiscard]] int failures() const { return failures_; }

 private:
  bool fails_ = false;
  int failures_ = 0;
};

class FolderSyncTest : public Scene, public ::testing::WithParamInterface<Operation> {
 protected:
  void SetUp() override {
    Scene::SetUp();
    study(GetParam());
    reset();
  }

  UnsyncedFolder folder_;
};

// The change stands in the file, for nobody can put the journal back; but what
// a power cut may still take back is not acknowledged.
TEST_P(FolderSyncTest, ThatFailsIsReported) {
  const FaultyVfs vfs(folder_);
  const auto store = operation_.open();
  folder_.setFailing(true);
  EXPECT_FALSE(operation_.run(*store).success);
  EXPECT_GT(folder_.failures(), 0);
  EXPECT_EQ(store->GetErrCode(), SQLITE_IOERR);
  EXPECT_EQ(store->GetErrMsg(), "disk I/O error");

  const Inspection found = inspect();
  EXPECT_EQ(found.integrity, "ok|\n");
  EXPECT_GE(indexOf(found.state), 1);
}

TEST_P(FolderSyncTest, ThatWorksAgainLetsTheObjectWork) {
  const FaultyVfs vfs(folder_);
  const auto store = operation_.open();
  folder_.setFailing(true);
  operation_.run(*store);
  folder_.setFailing(false);
  EXPECT_EQ(store->DBCmd("CREATE TABLE other(a)", nullptr, nullptr), 1);
}

INSTANTIATE_TEST_SUITE_P(EveryChange, FolderSyncTest, ::testing::ValuesIn(everyChange()),
                         support::CaseName());

}  // namespace
}  // namespace faults
