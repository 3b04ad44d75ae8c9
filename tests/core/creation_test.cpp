// The database file that the library creates: whose it is, what it leaves alone,
// and what it never creates.

#include <endian.h>
#include <fcntl.h>
#include <linux/posix_acl_xattr.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstddef>
#include <filesystem>

#include "tests/core/core_test.h"
#include "tests/support/case_name.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::FakeIds;
using ::testing::ElementsAre;
namespace fs = std::filesystem;

constexpr int kCannotOpen = 14;

unsigned int modeOf(const std::string& path) {
  struct stat status {};
  EXPECT_EQ(stat(path.c_str(), &status), 0) << path;
  return status.st_mode & 07777U;
}

/// Puts the umask of the process back at the end.
class Umask {
 public:
  explicit Umask(mode_t mask) : previous_(umask(mask)) {}
  ~Umask() { umask(previous_); }
  Umask(const Umask&) = delete;
  Umask& operator=(const Umask&) = delete;

  static mode_t current() {
    const mode_t mask = umask(0);
    umask(mask);
    return mask;
  }

 private:
  mode_t previous_;
};

class CreationTest : public CoreTest {
 protected:
  static std::string journal() { return std::string(kDatabase) + "-journal"; }

  static void beginWriting(OAUTHDBBasic& store) {
    store.DBCmd("BEGIN; INSERT INTO oauth_log VALUES(1, 'a', 1)", nullptr, nullptr);
  }

  static void expectNotOpened(const OAUTHDBBasic& store) {
    expectError(store, kCannotOpen, "Open DB failed!!");
    EXPECT_THAT(lines(), ElementsAre(Line{kError, "Open DB failed!![%d]", "Open DB failed!![14]"}));
  }
};

// Mode --------------------------------------------------------------------------

class FileModeTest : public CreationTest, public ::testing::WithParamInterface<mode_t> {};

TEST_P(FileModeTest, CreatedFileIsItsOwnersAlone) {
  const Umask callers(GetParam());
  const OAUTHDBBasic store;
  expectNoError(store);
  EXPECT_EQ(modeOf(kDatabase), 0600U);
}

TEST_P(FileModeTest, JournalOfACreatedFileIsItsOwnersAlone) {
  const Umask callers(GetParam());
  OAUTHDBBasic store;
  beginWriting(store);
  EXPECT_EQ(modeOf(journal()), 0600U);
}

TEST_P(FileModeTest, CreatedFileIsNobodyElsesFromTheFirstMoment) {
  const Umask callers(GetParam());
  unsigned int mode = 07777;
  Creation::after([&] { mode = modeOf(kDatabase); });
  const OAUTHDBBasic store;
  EXPECT_EQ(mode & ~0600U, 0U);
}

TEST_P(FileModeTest, UmaskIsTheCallersAllAlong) {
  const Umask callers(GetParam());
  mode_t duringOpen = 07777;
  Engine::onOpen([&](int /*error*/) { duringOpen = Umask::current(); });
  const OAUTHDBBasic store;
  EXPECT_EQ(duringOpen, GetParam());
  EXPECT_EQ(Umask::current(), GetParam());
}

INSTANTIATE_TEST_SUITE_P(Core, FileModeTest, ::testing::Values(0, 022, 077, 0177, 0777),
                         [](const auto& row) { return "Umask0" + std::to_string(row.param); });

TEST_F(CreationTest, FileThatAnotherThreadMakesMeanwhileHasTheModeOfItsOwnUmask) {
  const Umask callers(022);
  Engine::onOpen([](int /*error*/) { writeFile("/tmp/other", ""); });
  const OAUTHDBBasic store;
  EXPECT_EQ(modeOf("/tmp/other"), 0644U);
}

TEST_F(CreationTest, ModeOfAnExistingFileStays) {
  for (const mode_t mode : {0644, 0666, 0640, 0600, 0755, 0400}) {
    fs::remove(kDatabase);
    { const OAUTHDBBasic store; }
    ASSERT_EQ(chmod(kDatabase, mode), 0);
    const OAUTHDBBasic store;
    EXPECT_EQ(modeOf(kDatabase), mode);
  }
}

TEST_F(CreationTest, ModeOfAnExistingEmptyFileStays) {
  for (const mode_t mode : {0664, 0400}) {
    fs::remove(kDatabase);
    writeFile(kDatabase, "");
    ASSERT_EQ(chmod(kDatabase, mode), 0);
    const OAUTHDBBasic store;
    expectNoError(store);
    EXPECT_EQ(modeOf(kDatabase), mode);
  }
}

TEST_F(CreationTest, JournalTakesTheModeOfAnExistingFile) {
  writeFile(kDatabase, "");
  ASSERT_EQ(chmod(kDatabase, 0640), 0);
  OAUTHDBBasic store;
  beginWriting(store);
  EXPECT_EQ(modeOf(journal()), 0640U);
}

// Default ACL of the folder -------------------------------------------------------

/// As the kernel has it, in the same order of bytes on every machine: owner, one
/// named user, group, mask, others.
struct DefaultAcl {
  const char* name;
  __u16 owner;
  __u16 others;
};

void PrintTo(const DefaultAcl& acl, std::ostream* out) {
  *out << acl.name;
}

class DefaultAclTest : public CreationTest, public ::testing::WithParamInterface<DefaultAcl> {
 protected:
  void SetUp() override {
    CreationTest::SetUp();
    const struct {
      posix_acl_xattr_header header;
      std::array<posix_acl_xattr_entry, 5> entries;
    } acl{
        {htole32(POSIX_ACL_XATTR_VERSION)},
        {{entry(1, GetParam().owner, ~0U),  // ACL_USER_OBJ and so on, in their order
          entry(2, 7, geteuid()),           // one that a namespace of one user knows, too
          entry(4, GetParam().others, ~0U), entry(16, 7, ~0U), entry(32, GetParam().others, ~0U)}}};
    constexpr std::size_t kSize = sizeof acl.header + sizeof acl.entries;
    static_assert(sizeof acl == kSize);
    ASSERT_EQ(setxattr(kStateDir, "system.posix_acl_default", &acl, kSize, 0), 0) << errno;
  }
  void TearDown() override {
    removexattr(kStateDir, "system.posix_acl_default");
    CreationTest::TearDown();
  }

 private:
  static posix_acl_xattr_entry entry(__u16 tag, __u16 permissions, __u32 id) {
    return {htole16(tag), htole16(permissions), htole32(id)};
  }
};

TEST_P(DefaultAclTest, GivesNobodyElseTheFile) {
  const Umask callers(022);
  const OAUTHDBBasic store;
  expectNoError(store);
  EXPECT_EQ(modeOf(kDatabase), 0600U);  // the group's bits are the mask for named users
}

TEST_P(DefaultAclTest, GivesNobodyElseTheJournal) {
  const Umask callers(022);
  OAUTHDBBasic store;
  beginWriting(store);
  EXPECT_EQ(modeOf(journal()), 0600U);
}

INSTANTIATE_TEST_SUITE_P(Core, DefaultAclTest,
                         ::testing::Values(DefaultAcl{"OpenToAll", 7, 7},
                                           DefaultAcl{"OpenToOneUser", 7, 0},
                                           DefaultAcl{"ShutToTheOwner", 0, 5}),
                         support::CaseName());

// Links ---------------------------------------------------------------------------

TEST_F(CreationTest, LinkIntoNowhereCreatesNothing) {
  for (const char* target : {"/tmp/elsewhere.db", "/tmp/missing/oauth.db", "elsewhere.db"}) {
    fs::remove(kDatabase);
    fs::create_symlink(target, kDatabase);
    support::SystemLog::clear();
    expectNotOpened(OAUTHDBBasic());
    EXPECT_TRUE(fs::is_symlink(kDatabase));
    EXPECT_FALSE(fs::exists(kDatabase)) << target;
  }
}

TEST_F(CreationTest, LinkThatLeadsToItselfFailsTheOpen) {
  fs::create_symlink("oauth.db", kDatabase);
  expectNotOpened(OAUTHDBBasic());
}

TEST_F(CreationTest, LinkToAnExistingFileIsFollowed) {
  { const OAUTHDBBasic store; }
  fs::copy(kDatabase, "/tmp/elsewhere.db");
  fs::remove(kDatabase);
  ASSERT_EQ(chmod("/tmp/elsewhere.db", 0640), 0);
  fs::create_symlink("/tmp/elsewhere.db", kDatabase);
  Table store("oauth_meta");
  expectNoError(store);
  Json::Value count;
  EXPECT_EQ(store.DBGetRowCount(count), 1);
  EXPECT_EQ(count, json("['3']"));
  EXPECT_EQ(modeOf("/tmp/elsewhere.db"), 0640U);
  EXPECT_TRUE(fs::is_symlink(kDatabase));
  fs::remove("/tmp/elsewhere.db");
}

// Failures and races --------------------------------------------------------------

TEST_F(CreationTest, ExistingFileIsNotCreated) {
  writeFile(kDatabase, "");
  const OAUTHDBBasic store;
  EXPECT_EQ(Creation::attempts(), 0);
}

TEST_F(CreationTest, FileThatAppearsMeanwhileIsOpenedAsItIs) {
  const Umask callers(022);
  Creation::before([](int /*nth*/) { writeFile(kDatabase, ""); });
  const OAUTHDBBasic store;
  expectNoError(store);
  EXPECT_EQ(modeOf(kDatabase), 0644U);
}

TEST_F(CreationTest, FileThatComesAndGoesIsCreatedInTheEnd) {
  Creation::refuse(EEXIST, 2);  // there at the attempt, gone when it is looked for
  const OAUTHDBBasic store;
  expectNoError(store);
  EXPECT_EQ(Creation::attempts(), 3);
  EXPECT_EQ(modeOf(kDatabase), 0600U);
}

TEST_F(CreationTest, InterruptedCreationIsTakenUpAgain) {
  Creation::refuse(EINTR, 3);
  const OAUTHDBBasic store;
  expectNoError(store);
  EXPECT_EQ(modeOf(kDatabase), 0600U);
}

/// SQLite's own attempt a moment later might succeed, with a mode of its own.
TEST_F(CreationTest, FileThatCannotBeCreatedIsNotLeftToTheEngine) {
  for (const int error : {EIO, ENOSPC, EDQUOT, ENOMEM, EPERM, ENOSYS}) {
    support::SystemLog::clear();
    Creation::refuse(error, 1);
    expectNotOpened(OAUTHDBBasic());
    EXPECT_EQ(Engine::opened(), 0);
    EXPECT_FALSE(fs::exists(kDatabase)) << error;
  }
}

TEST_F(CreationTest, ClosedWayIsTheEnginesToReport) {
  hideFolder();
  expectNotOpened(OAUTHDBBasic());
  EXPECT_EQ(Engine::opened(), 1);
}

TEST_F(CreationTest, EngineFindsTheErrnoOfThePrivilegeSwitch) {
  int seen = -1;
  Engine::onOpen([&](int error) { seen = error; });
  { const OAUTHDBBasic created; }
  EXPECT_EQ(seen, 0);

  fs::remove(kDatabase);
  FakeIds::use(1000, 1000);
  FakeIds::refuseCall(1, EPERM);
  { const OAUTHDBBasic created; }
  EXPECT_EQ(seen, 1);
  FakeIds::release();
}

// Locks ---------------------------------------------------------------------------

/// As another process sees it. (To close a descriptor of the file in this one
/// would end the locks.)
bool isLocked(const char* path) {
  const pid_t child = fork();
  if (child == 0) {
    struct flock lock {};
    lock.l_type = F_WRLCK;
    const int file = open(path, O_RDWR);
    const bool isAsked = file >= 0 && fcntl(file, F_GETLK, &lock) == 0;
    _exit(isAsked && lock.l_type != F_UNLCK ? 1 : 0);
  }
  int status = -1;
  EXPECT_EQ(waitpid(child, &status, 0), child);
  return WIFEXITED(status) && WEXITSTATUS(status) == 1;
}

/// Another thread may find the new file at once, open it and lock it. Mode
/// bits that are still missing are no reason to take its locks away.
TEST_F(CreationTest, LocksOnTheNewFileOutliveItsCreation) {
  sqlite3* other = nullptr;
  bool wasLocked = false;
  bool isStillLocked = false;
  Creation::after([&] {
    ASSERT_EQ(sqlite3_open(kDatabase, &other), SQLITE_OK);
    ASSERT_EQ(sqlite3_exec(other, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr), SQLITE_OK);
    wasLocked = isLocked(kDatabase);
    Engine::onOpen([&](int /*error*/) {
      isStillLocked = isLocked(kDatabase);
      sqlite3_close(other);
    });
  });
  const Umask callers(0777);
  const OAUTHDBBasic store;
  expectNoError(store);
  EXPECT_TRUE(wasLocked);
  EXPECT_TRUE(isStillLocked);
  EXPECT_EQ(modeOf(kDatabase), 0600U);
}

}  // namespace
