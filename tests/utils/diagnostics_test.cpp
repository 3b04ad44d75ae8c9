#include <linux/capability.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <filesystem>
#include <thread>

#include "tests/support/case_name.h"
#include "tests/support/world.h"
#include "tests/utils/kernel.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace {

using namespace KELDOAUTHSERVER;
using support::SystemLog;
using ::testing::IsEmpty;
using ::testing::SizeIs;
namespace fs = std::filesystem;

/// Both switches are kept per thread, so every case asks in a thread of its own.
class DiagnosticsTest : public support::World {
 protected:
  void SetUp() override {
    World::SetUp();
    Kernel::release();
  }

  static void raiseFlag() { writeFile(kFlagFile, ""); }
  static void setLevel(const std::string& level) {
    writeSettings("{\"log_level\": " + level + "}");
  }

  static bool enabledInFreshThread() {
    bool enabled = false;
    inFreshThread([&] { enabled = isDebugEnabled(); });
    return enabled;
  }

  static int levelInFreshThread() {
    int level = 0;
    inFreshThread([&] { level = getLogLevel(); });
    return level;
  }

  /// A trace of class 4, the only class that the utilities write.
  static void trace() { checkStrLen("text", 0, 9); }
};

// The flag file ---------------------------------------------------------------

TEST_F(DiagnosticsTest, OffWithoutFlagFile) {
  EXPECT_FALSE(enabledInFreshThread());
}

TEST_F(DiagnosticsTest, OnWithFlagFile) {
  raiseFlag();
  EXPECT_TRUE(enabledInFreshThread());
}

TEST_F(DiagnosticsTest, FlagFileIsTheDocumentedOne) {
  EXPECT_STREQ(names::kDebugFlagFile, "/tmp/keldoauth_debug");
  EXPECT_STREQ(names::kDebugFlagFile, kFlagFile);
}

TEST_F(DiagnosticsTest, ContentOfFlagFileDoesNotMatter) {
  writeFile(kFlagFile, "0\noff\n");
  EXPECT_TRUE(enabledInFreshThread());
}

TEST_F(DiagnosticsTest, ReadableDirectoryCountsAsFlag) {
  fs::create_directory(kFlagFile);
  EXPECT_TRUE(enabledInFreshThread());
}

TEST_F(DiagnosticsTest, FifoCountsAsFlagAndIsNotOpened) {
  ASSERT_EQ(mkfifo(kFlagFile, 0600), 0);
  EXPECT_TRUE(enabledInFreshThread());
  EXPECT_EQ(Kernel::opened(kFlagFile), 0);
}

TEST_F(DiagnosticsTest, DanglingLinkIsNoFlag) {
  fs::create_symlink("/tmp/nowhere", kFlagFile);
  EXPECT_FALSE(enabledInFreshThread());
}

/// Root that is held to the modes of files, in any namespace.
bool giveUpPrivileges() {
  __user_cap_header_struct self{_LINUX_CAPABILITY_VERSION_3, 0};
  const std::array<__user_cap_data_struct, _LINUX_CAPABILITY_U32S_3> none{};
  return syscall(SYS_capset, &self, none.data()) == 0;
}

TEST_F(DiagnosticsTest, UnreadableFlagFileIsNoFlag) {
  raiseFlag();
  ASSERT_EQ(chmod(kFlagFile, 0), 0);

  const pid_t child = fork();
  if (child == 0) {
    if (!giveUpPrivileges()) _exit(2);
    bool enabled = true;
    std::thread([&] { enabled = isDebugEnabled(); }).join();
    _exit(enabled ? 1 : 0);
  }
  int status = 0;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_TRUE(WIFEXITED(status));
  EXPECT_EQ(WEXITSTATUS(status), 0);
}

TEST_F(DiagnosticsTest, FlagIsLookedUpOncePerThread) {
  inFreshThread([] {
    isDebugEnabled();
    isDebugEnabled();
    trace();
  });
  EXPECT_EQ(Kernel::askedForAccess(kFlagFile), 1);
  enabledInFreshThread();
  EXPECT_EQ(Kernel::askedForAccess(kFlagFile), 2);
}

TEST_F(DiagnosticsTest, FlagFileThatAppearsLaterIsSeenByNewThreadsOnly) {
  inFreshThread([] {
    EXPECT_FALSE(isDebugEnabled());
    raiseFlag();
    EXPECT_FALSE(isDebugEnabled());
    EXPECT_TRUE(enabledInFreshThread());
    EXPECT_FALSE(isDebugEnabled());
  });
}

TEST_F(DiagnosticsTest, FlagFileThatGoesStaysUpInThreadsThatSawIt) {
  raiseFlag();
  inFreshThread([] {
    EXPECT_TRUE(isDebugEnabled());
    fs::remove(kFlagFile);
    EXPECT_TRUE(isDebugEnabled());
    EXPECT_FALSE(enabledInFreshThread());
  });
}

// The log level ---------------------------------------------------------------

struct Level {
  const char* name;
  const char* settings;
  int level;
};

void PrintTo(const Level& level, std::ostream* out) {
  *out << level.settings;
}

class LogLevelTest : public DiagnosticsTest, public ::testing::WithParamInterface<Level> {};

TEST_P(LogLevelTest, IsReadAsItStands) {
  writeSettings(GetParam().settings);
  EXPECT_EQ(levelInFreshThread(), GetParam().level);
}

const Level kLevels[] = {
    {"Zero", R"({"log_level": 0})", 0},
    {"Nine", R"({"log_level": 9})", 9},
    {"UnknownBits", R"({"log_level": 1048576})", 1048576},
    {"HighestInt", R"({"log_level": 2147483647})", 2147483647},
    {"MinusOne", R"({"log_level": -1})", -1},
    {"MinusSixteen", R"({"log_level": -16})", -16},
    {"AboveInt", R"({"log_level": 2147483648})", 0},
    {"String", R"({"log_level": "15"})", 0},
    {"Fraction", R"({"log_level": 15.5})", 0},
    {"Boolean", R"({"log_level": true})", 0},
    {"Null", R"({"log_level": null})", 0},
    {"NoObject", "[15]", 0},
    {"Truncated", R"({"log_level": 15)", 0},
};

INSTANTIATE_TEST_SUITE_P(Diagnostics, LogLevelTest, ::testing::ValuesIn(kLevels),
                         support::CaseName());

TEST_F(DiagnosticsTest, LevelIsKeptForTheLifeOfTheThread) {
  setLevel("5");
  inFreshThread([] {
    EXPECT_EQ(getLogLevel(), 5);
    setLevel("6");
    EXPECT_EQ(getLogLevel(), 5);
    EXPECT_EQ(levelInFreshThread(), 6);
  });
  EXPECT_EQ(Kernel::opened(kSettings), 2);
}

TEST_F(DiagnosticsTest, AbsentFileIsKeptAsLevelZero) {
  inFreshThread([] {
    EXPECT_EQ(getLogLevel(), 0);
    setLevel("15");
    EXPECT_EQ(getLogLevel(), 0);
  });
}

TEST_F(DiagnosticsTest, LevelMinusOneIsReadAgainAtTheNextQuestion) {
  setLevel("-1");
  inFreshThread([] {
    EXPECT_EQ(getLogLevel(), -1);
    EXPECT_EQ(getLogLevel(), -1);
    EXPECT_EQ(Kernel::opened(kSettings), 2);
    setLevel("4");
    EXPECT_EQ(getLogLevel(), 4);
    setLevel("5");
    EXPECT_EQ(getLogLevel(), 4);
  });
}

TEST_F(DiagnosticsTest, LevelDoesNotDependOnTheFlagFile) {
  setLevel("15");
  EXPECT_EQ(levelInFreshThread(), 15);
}

// The gate --------------------------------------------------------------------

TEST_F(DiagnosticsTest, WithoutFlagFileTheSettingsAreNotOpenedForTheLevel) {
  setLevel("15");
  inFreshThread(trace);
  EXPECT_EQ(Kernel::askedForAccess(kFlagFile), 1);
  EXPECT_EQ(Kernel::opened(kSettings), 0);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(DiagnosticsTest, WithFlagFileTheSettingsAreOpenedOnceForAllTraces) {
  withDiagnostics(4, [] {
    trace();
    trace();
  });
  EXPECT_EQ(Kernel::opened(kSettings), 1);
  EXPECT_THAT(SystemLog::lines(), SizeIs(2));
}

TEST_F(DiagnosticsTest, FlagFileAloneTracesNothing) {
  raiseFlag();
  inFreshThread(trace);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(DiagnosticsTest, TraceIsWrittenExactlyWhenTheLevelHasItsBit) {
  for (int level = 0; level <= 32; ++level) {
    SystemLog::clear();
    withDiagnostics(level, trace);
    EXPECT_EQ(SystemLog::lines().size(), (level & 4) != 0 ? 1U : 0U) << "level " << level;
  }
}

TEST_F(DiagnosticsTest, LevelMinusOneTracesEveryClass) {
  withDiagnostics(-1, trace);
  EXPECT_THAT(SystemLog::lines(), SizeIs(1));
}

TEST_F(DiagnosticsTest, OtherNegativeLevelsAreBitMasksToo) {
  withDiagnostics(-5, trace);  // every bit but 4
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
  withDiagnostics(-2, trace);  // every bit but 1
  EXPECT_THAT(SystemLog::lines(), SizeIs(1));
}

}  // namespace
