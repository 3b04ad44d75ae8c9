#include "service/people/htpasswd_edit.h"

#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <string>

#include "service/people/htpasswd.h"
#include "tests/service/people/scene.h"

namespace {

using keldoauth::service::DirectoryTrouble;
using keldoauth::service::HtpasswdUsers;
using keldoauth::service::readHtpasswd;
using keldoauth::service::removeHtpasswdUser;
using keldoauth::service::setHtpasswdUser;
using keldoauth::service::Verdict;

class HtpasswdEditTest : public scene::Folder {
 protected:
  bool set(const std::string& user, const std::string& password = "secret") const {
    return setHtpasswdUser(at("users"), user, password);
  }
  bool remove(const std::string& user) const { return removeHtpasswdUser(at("users"), user); }
  [[nodiscard]] bool isIn(const std::string& user, const std::string& password) const {
    return HtpasswdUsers(at("users"), "key").checkPassword(user, password).verdict == Verdict::kYes;
  }
  [[nodiscard]] struct stat state() const {
    struct stat state {};
    EXPECT_EQ(stat(at("users").c_str(), &state), 0);
    return state;
  }
};

TEST_F(HtpasswdEditTest, AUserWhoWasAddedCanSignIn) {
  EXPECT_TRUE(set("alice", "one"));
  EXPECT_TRUE(set("bob", "two"));
  EXPECT_TRUE(isIn("alice", "one"));
  EXPECT_TRUE(isIn("bob", "two"));
  EXPECT_EQ(names(), std::vector<std::string>{"users"});
}

TEST_F(HtpasswdEditTest, ANewPasswordTakesTheOldOnesPlace) {
  write("users", "# people\nalice:!\nbob:!\n");
  EXPECT_FALSE(set("alice"));
  EXPECT_TRUE(isIn("alice", "secret"));
  const auto lines = readHtpasswd(read("users"));
  ASSERT_EQ(lines.size(), 2U);
  EXPECT_EQ(lines[0].name, "alice");
  EXPECT_EQ(read("users").substr(0, 9), "# people\n");
}

TEST_F(HtpasswdEditTest, ARemovedUserIsGoneWithEveryLine) {
  write("users", "alice:!\nbob:!\nalice:x\n# alice\nalice2:!\n");
  EXPECT_TRUE(remove("alice"));
  EXPECT_EQ(read("users"), "bob:!\n# alice\nalice2:!\n");
}

TEST_F(HtpasswdEditTest, RemovingNobodyChangesNothing) {
  write("users", "bob:!");
  const auto before = state().st_ino;
  EXPECT_FALSE(remove("alice"));
  EXPECT_EQ(state().st_ino, before);
  EXPECT_EQ(read("users"), "bob:!");
}

TEST_F(HtpasswdEditTest, ALastLineWithoutAnEndIsNotRunInto) {
  write("users", "bob:!");
  EXPECT_TRUE(set("alice"));
  EXPECT_EQ(read("users").substr(0, 12), "bob:!\nalice:");
}

TEST_F(HtpasswdEditTest, OwnerAndModeStay) {
  write("users", "bob:!\n", 0664);
  // A group of others, where this process may give files away.
  const bool isGiven = chown(at("users").c_str(), 1, 1) == 0;
  ASSERT_TRUE(isGiven || errno == EINVAL);
  const struct stat before = state();
  set("alice");
  EXPECT_EQ(state().st_mode, before.st_mode);
  EXPECT_EQ(state().st_uid, before.st_uid);
  EXPECT_EQ(state().st_gid, before.st_gid);
  EXPECT_NE(state().st_ino, before.st_ino);
}

TEST_F(HtpasswdEditTest, ANewFileIsClosedToOthersWhateverTheUmask) {
  const mode_t before = umask(0);
  set("alice");
  umask(before);
  EXPECT_EQ(state().st_mode & 07777U, 0640U);
}

TEST_F(HtpasswdEditTest, ALinkStaysALink) {
  write("real", "bob:!\n");
  ASSERT_EQ(symlink("real", at("users").c_str()), 0);
  set("alice");
  EXPECT_NE(read("real").find("alice:"), std::string::npos);
  struct stat state {};
  ASSERT_EQ(lstat(at("users").c_str(), &state), 0);
  EXPECT_TRUE(S_ISLNK(state.st_mode));
}

TEST_F(HtpasswdEditTest, ALinkThatLeadsNowhereMakesNothing) {
  ASSERT_EQ(symlink("nowhere", at("users").c_str()), 0);
  EXPECT_THROW(set("alice"), DirectoryTrouble);
  EXPECT_EQ(names(), std::vector<std::string>{"users"});
}

TEST_F(HtpasswdEditTest, NamesAndPasswordsThatCannotBeUsedAreRefused) {
  for (const char* user : {"", "a:b", "a\nb:x", "#a", "\xFF"}) {
    EXPECT_THROW(set(user), DirectoryTrouble) << user;
  }
  for (const std::string& password : {std::string(), std::string("a\nb"), std::string(512, 'a')}) {
    EXPECT_THROW(set("alice", password), DirectoryTrouble) << password;
  }
  EXPECT_TRUE(names().empty());
}

TEST_F(HtpasswdEditTest, RemovingFromAMissingFileIsAFailure) {
  EXPECT_THROW(remove("alice"), DirectoryTrouble);
}

/// What a full medium does, for one more file of ours.
TEST_F(HtpasswdEditTest, AFileThatCannotBeWrittenLeavesTheOldOne) {
  write("users", "bob:!\n" + std::string(5000, '#') + "\n");
  const std::string before = read("users");
  const auto handler = std::signal(SIGXFSZ, SIG_IGN);
  rlimit old{};
  getrlimit(RLIMIT_FSIZE, &old);
  const rlimit small{4096, old.rlim_max};
  setrlimit(RLIMIT_FSIZE, &small);
  EXPECT_THROW(set("alice"), DirectoryTrouble);
  setrlimit(RLIMIT_FSIZE, &old);
  std::signal(SIGXFSZ, handler);
  EXPECT_EQ(read("users"), before);
  EXPECT_EQ(names(), std::vector<std::string>{"users"});
}

TEST_F(HtpasswdEditTest, ChangesAtTheSameTimeAreAllMade) {
  constexpr int kProcesses = 6;
  for (int i = 0; i < kProcesses; ++i) {
    if (fork() != 0) continue;
    try {
      set("user" + std::to_string(i));
      _exit(0);
    } catch (...) {
      _exit(1);
    }
  }
  for (int i = 0; i < kProcesses; ++i) {
    int status = 1;
    wait(&status);
    EXPECT_EQ(status, 0);
  }
  EXPECT_EQ(readHtpasswd(read("users")).size(), std::size_t{kProcesses});
}

}  // namespace
