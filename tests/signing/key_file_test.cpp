#include "service/signing/key_file.h"

#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>

#include "tests/signing/signing_test.h"

namespace signing_test {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

namespace fs = std::filesystem;

const std::string kPrefix = "key file /tmp/keys/signing.json: ";
constexpr uid_t kSomebody = 4711;

class KeyFileTest : public SigningTest {
 protected:
  const KeyFile file_{kPath};

  [[nodiscard]] std::string failure() const {
    return failureOf([&] { static_cast<void>(file_.read()); });
  }
  /// The result of a process of another user.
  static int asUser(uid_t user, const std::function<int()>& body) {
    const pid_t child = fork();
    if (child == 0) {
      if (setgid(user) != 0 || setuid(user) != 0) _exit(100);
      _exit(body());
    }
    int status = -1;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  }
  static int readsIt() {
    return failureOf([] { static_cast<void>(KeyFile(kPath).read()); }).empty() ? 0 : 1;
  }
};

TEST_F(KeyFileTest, KeepsWhatWasCreated) {
  file_.create(anySet(), {});
  EXPECT_EQ(file_.read().text(), anySet().text());
  EXPECT_THAT(filesIn(kFolder), ElementsAre("signing.json"));
}

TEST_F(KeyFileTest, IsForItsOwnerAloneUnderAnyUmask) {
  for (const mode_t mask : {0000U, 0077U, 0777U}) {
    fs::remove(kPath);
    const mode_t before = umask(mask);
    file_.create(anySet(), {});
    umask(before);
    EXPECT_EQ(modeOf(kPath), 0600U) << std::oct << mask;
  }
}

TEST_F(KeyFileTest, MayBeMadeForAnotherUserAndHisGroup) {
  file_.create(anySet(), {kSomebody, kSomebody + 1, 0640});
  struct stat status {};
  ASSERT_EQ(stat(kPath, &status), 0);
  EXPECT_EQ(status.st_uid, kSomebody);
  EXPECT_EQ(status.st_gid, kSomebody + 1);
  EXPECT_EQ(modeOf(kPath), 0640U);
}

TEST_F(KeyFileTest, CreationNeverOverwrites) {
  writeFile(kPath, "precious");
  EXPECT_EQ(failureOf([&] { file_.create(anySet(), {}); }), kPrefix + "File exists");
  EXPECT_EQ(readFile(kPath), "precious");
  EXPECT_THAT(filesIn(kFolder), ElementsAre("signing.json"));
}

TEST_F(KeyFileTest, CreationFollowsNoLink) {
  for (const char* target : {"/tmp/keys/absent", "/tmp/keys", "signing.json"}) {
    fs::remove(kPath);
    ASSERT_EQ(symlink(target, kPath), 0);
    EXPECT_EQ(failureOf([&] { file_.create(anySet(), {}); }), kPrefix + "File exists") << target;
    EXPECT_TRUE(fs::is_symlink(kPath));
    EXPECT_THAT(filesIn(kFolder), ElementsAre("signing.json"));
  }
}

TEST_F(KeyFileTest, CreationInAMissingFolderFails) {
  const KeyFile file("/tmp/absent/signing.json");
  EXPECT_THAT(failureOf([&] { file.create(anySet(), {}); }),
              ::testing::HasSubstr("No such file or directory"));
}

TEST_F(KeyFileTest, MissingOneIsSaid) {
  EXPECT_EQ(failure(), kPrefix + "No such file or directory");
  EXPECT_EQ(failureOf([&] { file_.update([](KeySet&) {}); }),
            kPrefix + "No such file or directory");
  EXPECT_THAT(filesIn(kFolder), IsEmpty());
}

TEST_F(KeyFileTest, LinkIsRefused) {
  writeFile("/tmp/keys/real", anySet().text());
  for (const char* target : {"/tmp/keys/real", "/tmp/keys/absent", "signing.json"}) {
    fs::remove(kPath);
    ASSERT_EQ(symlink(target, kPath), 0);
    EXPECT_EQ(failure(), kPrefix + "is a symbolic link") << target;
    EXPECT_EQ(failureOf([&] { file_.update([](KeySet& set) { set.rotate(kStart); }); }),
              kPrefix + "is a symbolic link");
  }
  EXPECT_EQ(readFile("/tmp/keys/real"), anySet().text());
}

TEST_F(KeyFileTest, OtherKindsOfFilesAreRefused) {
  ASSERT_EQ(mkdir(kPath, 0700), 0);
  EXPECT_EQ(failure(), kPrefix + "is not a regular file");
  fs::remove(kPath);
  ASSERT_EQ(mkfifo(kPath, 0600), 0);
  EXPECT_EQ(failure(), kPrefix + "is not a regular file");
}

TEST_F(KeyFileTest, FileThatOthersCanReachIsRefused) {
  putAnySet();
  for (const mode_t mode : {0604U, 0602U, 0601U, 0620U, 0610U, 0660U, 0644U, 0700U}) {
    ASSERT_EQ(chmod(kPath, mode), 0);
    EXPECT_EQ(failure(), kPrefix + "is open to others, or can be executed") << std::oct << mode;
  }
  for (const mode_t mode : {0600U, 0640U, 0400U, 0440U}) {
    ASSERT_EQ(chmod(kPath, mode), 0);
    EXPECT_EQ(failure(), "") << std::oct << mode;
  }
}

TEST_F(KeyFileTest, BelongsToItsReaderOrToRoot) {
  putAnySet();
  ASSERT_EQ(chmod(kPath, 0640), 0);
  ASSERT_EQ(chown(kPath, kSomebody, kSomebody), 0);
  EXPECT_EQ(asUser(kSomebody, readsIt), 0);
  ASSERT_EQ(chown(kPath, 0, kSomebody), 0);
  EXPECT_EQ(asUser(kSomebody, readsIt), 0);
  ASSERT_EQ(chown(kPath, kSomebody + 1, kSomebody), 0);
  EXPECT_EQ(asUser(kSomebody, readsIt), 1);
  EXPECT_EQ(failure(), "") << "root looks after it for its owner";
}

TEST_F(KeyFileTest, WhatItSaysWrongIsSaid) {
  writeFile(kPath, "{}");
  EXPECT_EQ(failure(), kPrefix + "is no set of keys");
  writeFile(kPath, std::string(kMaxKeySetText + 1, ' '));
  EXPECT_EQ(failure(), kPrefix + "is too long");
}

TEST_F(KeyFileTest, UpdateKeepsOwnerGroupAndMode) {
  putAnySet();
  ASSERT_EQ(chown(kPath, kSomebody, kSomebody + 1), 0);
  ASSERT_EQ(chmod(kPath, 0440), 0);
  file_.update([](KeySet& set) { set.rotate(kStart); });
  struct stat status {};
  ASSERT_EQ(stat(kPath, &status), 0);
  EXPECT_EQ(status.st_uid, kSomebody);
  EXPECT_EQ(status.st_gid, kSomebody + 1);
  EXPECT_EQ(modeOf(kPath), 0440U);
  EXPECT_EQ(file_.read().keys().size(), 4U);
}

TEST_F(KeyFileTest, UpdateThatChangesNothingWritesNothing) {
  putAnySet();
  struct stat before {};
  ASSERT_EQ(stat(kPath, &before), 0);
  file_.update([](KeySet&) {});
  struct stat after {};
  ASSERT_EQ(stat(kPath, &after), 0);
  EXPECT_EQ(after.st_ino, before.st_ino);
}

TEST_F(KeyFileTest, UpdateThatFailsChangesNothing) {
  putAnySet();
  EXPECT_EQ(failureOf([&] { file_.update([](KeySet&) { throw KeyFault("no"); }); }), "no");
  EXPECT_EQ(readFile(kPath), anySet().text());
  EXPECT_THAT(filesIn(kFolder), ElementsAre("signing.json"));
}

TEST_F(KeyFileTest, UpdateClearsAwayTheDraftOfAProcessThatWasKilled) {
  putAnySet();
  writeFile("/tmp/keys/signing.json.draft", "half of a k");
  file_.update([](KeySet& set) { set.rotate(kStart); });
  EXPECT_THAT(filesIn(kFolder), ElementsAre("signing.json"));
  EXPECT_EQ(file_.read().keys().size(), 4U);
}

TEST_F(KeyFileTest, LinkInTheDraftsPlaceLeadsNowhere) {
  putAnySet();
  writeFile("/tmp/keys/victim", "precious");
  ASSERT_EQ(symlink("/tmp/keys/victim", "/tmp/keys/signing.json.draft"), 0);
  file_.update([](KeySet& set) { set.rotate(kStart); });
  EXPECT_EQ(readFile("/tmp/keys/victim"), "precious");
  EXPECT_THAT(filesIn(kFolder), ElementsAre("signing.json", "victim"));
}

TEST_F(KeyFileTest, StandsInTheWorkingFolderWithoutASlash) {
  const fs::path before = fs::current_path();
  fs::current_path(kFolder);
  const KeyFile file("signing.json");
  file.create(anySet(), {});
  EXPECT_EQ(file.read().text(), anySet().text());
  fs::current_path(before);
}

}  // namespace
}  // namespace signing_test
