// How an absent key comes to be: whole or not at all, once for everybody, and
// for its owner alone.

#include <pthread.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <filesystem>
#include <functional>
#include <random>
#include <thread>

#include "tests/platform/platform_test.h"
#include "tests/platform/system_calls.h"
#include "tests/support/case_name.h"

namespace {

using support::SystemLog;
using ::testing::AnyOf;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class KeyCreationTest : public CipherTest {
 protected:
  static constexpr unsigned kPatience = 120;  // seconds

  /// Runs `body` in a process of its own, which ends with its result, or is
  /// ended when it waits for what never comes.
  static pid_t inProcess(const std::function<int()>& body) {
    const pid_t child = ::fork();
    if (child == 0) {
      ::alarm(kPatience);
      ::_exit(body());
    }
    return child;
  }
  static int statusOf(pid_t child) {
    int status = -1;
    EXPECT_EQ(::waitpid(child, &status, 0), child);
    return status;
  }
  /// Whether it came to a stop; else it has ended.
  static bool killWhereItStops(pid_t child) {
    int status = 0;
    EXPECT_EQ(::waitpid(child, &status, WUNTRACED), child);
    if (!WIFSTOPPED(status)) return false;
    ::kill(child, SIGKILL);
    return diedOfKill(statusOf(child));
  }
  static bool diedOfKill(int status) { return WIFSIGNALED(status) && WTERMSIG(status) == SIGKILL; }

  static bool isKeyThere() { return std::filesystem::exists(kKeyFile); }

  /// No key, or a whole one: then the next process gets along with what is
  /// there.
  static void expectNoneOrAll() {
    if (isKeyThere()) {
      EXPECT_EQ(readFile(kKeyFile).size(), 64U);
      EXPECT_EQ(modeOf(kKeyFile), 0600U);
    }
    const Text cipher = encrypt("text");
    ASSERT_TRUE(cipher.has_value());
    EXPECT_EQ(decrypt(*cipher), "text");
    EXPECT_THAT(SystemLog::lines(), IsEmpty());
  }

  static void removeAll() {
    for (const std::string& name : filesIn(kStateDir)) {
      std::filesystem::remove(std::string(kStateDir) + "/" + name);
    }
  }
};

TEST_F(KeyCreationTest, HappensAtTheFirstUse) {
  const Text cipher = encrypt("text");
  ASSERT_TRUE(cipher.has_value());
  EXPECT_EQ(decrypt(*cipher), "text");
  EXPECT_EQ(*cipher, seal(readFile(kKeyFile), "keldcore-1", "text"));
}

TEST_F(KeyCreationTest, LeavesTheKeyAlone) {
  encrypt("text");
  EXPECT_THAT(filesIn(kStateDir), ElementsAre("keldcore.key"));
  EXPECT_EQ(readFile(kKeyFile).size(), 64U);
  EXPECT_EQ(std::filesystem::hard_link_count(kKeyFile), 1U);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(KeyCreationTest, KeyIsForItsOwnerAloneUnderAnyUmask) {
  for (const mode_t mask : {0000, 0022, 0077, 0177, 0277, 0777}) {
    removeAll();
    const mode_t before = ::umask(mask);
    const Text cipher = encrypt("text");
    ::umask(before);
    EXPECT_TRUE(cipher.has_value()) << std::oct << mask;
    EXPECT_EQ(modeOf(kKeyFile), 0600U) << std::oct << mask;
  }
}

TEST_F(KeyCreationTest, KeysAreRandom) {
  encrypt("text");
  const std::string first = readFile(kKeyFile);
  removeAll();
  encrypt("text");
  const std::string second = readFile(kKeyFile);
  int same = 0;
  for (std::size_t i = 0; i < 64; ++i) same += first[i] == second[i] ? 1 : 0;
  EXPECT_LT(same, 8);
  EXPECT_NE(first.substr(0, 32), first.substr(32));
}

TEST_F(KeyCreationTest, RemovedKeyIsMadeAnew) {
  const std::string cipher = encrypt("text").value_or("");
  removeAll();
  EXPECT_EQ(decrypt(cipher), std::nullopt);
  EXPECT_NE(encrypt("text"), cipher);
  EXPECT_EQ(readFile(kKeyFile).size(), 64U);
}

TEST_F(KeyCreationTest, HappensInAnyFolder) {
  std::filesystem::create_directory("/tmp/folder");
  useKeyFile("/tmp/folder/any.key");
  EXPECT_TRUE(encrypt("text").has_value());
  EXPECT_THAT(filesIn("/tmp/folder"), ElementsAre("any.key"));
  EXPECT_THAT(filesIn(kStateDir), IsEmpty());
}

TEST_F(KeyCreationTest, BytesAreOnTheDiskBeforeTheirNameAndTheNameBeforeTheFirstUse) {
  SystemCalls::follow([](const std::string&) { return 0; });
  encrypt("text");
  EXPECT_THAT(SystemCalls::names(), ElementsAre("O_TMPFILE", "getentropy", "fchmod", "write",
                                                "fsync", "linkat", "fsync folder", "read"));
}

TEST_F(KeyCreationTest, MediumWithoutNamelessFilesGivesTheDraftAName) {
  SystemCalls::fail("O_TMPFILE", EOPNOTSUPP);
  const Text cipher = encrypt("text");
  EXPECT_THAT(SystemCalls::names(),
              ElementsAre("O_TMPFILE", "getentropy", "fchmod", "write", "fsync", "linkat",
                          "fsync folder", "unlink", "read"));
  SystemCalls::release();
  EXPECT_EQ(cipher, seal(readFile(kKeyFile), "keldcore-1", "text"));
  EXPECT_THAT(filesIn(kStateDir), ElementsAre("keldcore.key"));
}

TEST_F(KeyCreationTest, WritesMayBeShortAndInterrupted) {
  SystemCalls::moveOneByte();
  SystemCalls::follow([interrupt = false](const std::string& name) mutable {
    if (name != "write" && name != "read") return 0;
    interrupt = !interrupt;
    return interrupt ? EINTR : 0;
  });
  const Text cipher = encrypt("text");
  SystemCalls::release();
  EXPECT_EQ(cipher, seal(readFile(kKeyFile), "keldcore-1", "text"));
}

/// A step that fails, and what the log says then.
struct FailedStep {
  const char* name;
  const char* call;
  int error;
  const char* reason;
};

class FailedStepTest : public KeyCreationTest, public ::testing::WithParamInterface<FailedStep> {};

TEST_P(FailedStepTest, IsOneLineAndLeavesNothingBehind) {
  SystemCalls::fail(GetParam().call, GetParam().error);
  EXPECT_EQ(encrypt("text"), std::nullopt);
  SystemCalls::release();
  expectOneLine(kKeyFile, GetParam().reason);
  EXPECT_THAT(filesIn(kStateDir), IsEmpty());
}

const FailedStep kFailedSteps[] = {
    {"NoRandomBytes", "getentropy", ENOSYS, "Function not implemented"},
    {"ModeRefused", "fchmod", EPERM, "Operation not permitted"},
    {"DiskFull", "write", ENOSPC, "No space left on device"},
    {"DiskBroken", "fsync", EIO, "Input/output error"},
    {"NoNewFile", "O_TMPFILE", EROFS, "Read-only file system"},
    {"NoHardLinks", "linkat", EPERM, "Operation not permitted"},
};
INSTANTIATE_TEST_SUITE_P(KeyCreation, FailedStepTest, ::testing::ValuesIn(kFailedSteps),
                         support::CaseName());

// The name is there by then, and another process may have used it already.
TEST_F(KeyCreationTest, FolderThatCannotBeSyncedFailsTheCallAndKeepsTheKey) {
  SystemCalls::fail("fsync folder", EIO);
  EXPECT_EQ(encrypt("text"), std::nullopt);
  SystemCalls::release();
  expectOneLine(kKeyFile, "Input/output error");
  EXPECT_THAT(filesIn(kStateDir), ElementsAre("keldcore.key"));
  EXPECT_EQ(readFile(kKeyFile).size(), 64U);
}

const std::string kPlace = "/tmp/places/";
constexpr char kTooLong[] = "File name too long";
constexpr char kMissing[] = "is missing";

/// A place where no file can be made.
struct BadPlace {
  const char* name;
  std::string path;
  const char* reason;
  const char* reasonOfDecryption;
};

void PrintTo(const BadPlace& place, std::ostream* out) {
  *out << place.name;
}

class BadPlaceTest : public KeyCreationTest, public ::testing::WithParamInterface<BadPlace> {};

TEST_P(BadPlaceTest, IsOneLinePerCallAndNoKey) {
  std::filesystem::create_directory(kPlace);
  writeFile(kPlace + "file", "");
  useKeyFile(GetParam().path);
  EXPECT_EQ(encrypt("text"), std::nullopt);
  expectOneLine(GetParam().path, GetParam().reason);
  EXPECT_EQ(decrypt("BuUUoEG87WCe74gPRP1q0g"), std::nullopt);
  expectOneLine(GetParam().path, GetParam().reasonOfDecryption);
  EXPECT_THAT(filesIn(kPlace), ElementsAre("file"));
  EXPECT_THAT(filesIn(kStateDir), IsEmpty());
}

/// Leads nowhere, at any length.
std::string dots(int count) {
  std::string path;
  for (int i = 0; i < count; ++i) path += "./";
  return path;
}

const BadPlace kBadPlaces[] = {
    {"MissingFolder", kPlace + "absent/keldcore.key", "No such file or directory", kMissing},
    {"FileForAFolder", kPlace + "file/keldcore.key", "Not a directory", "Not a directory"},
    {"NameTooLong", kPlace + std::string(256, 'k'), kTooLong, kTooLong},
    {"PathTooLong", kPlace + std::string(5000, 'k'), kTooLong, kTooLong},
};
INSTANTIATE_TEST_SUITE_P(KeyCreation, BadPlaceTest, ::testing::ValuesIn(kBadPlaces),
                         support::CaseName());

// Names that would have no room for a draft's beside them.
TEST_F(KeyCreationTest, HappensUnderTheLongestNames) {
  std::filesystem::create_directory(kPlace);
  for (const std::string& name : {std::string(255, 'k'), dots(2041) + "k"}) {
    useKeyFile(kPlace + name);
    EXPECT_NE(encrypt("text"), std::nullopt);
    EXPECT_THAT(SystemLog::lines(), IsEmpty());
  }
}

TEST_F(KeyCreationTest, NamelessFilesUnknownAndNoRoomForADraftIsOneLine) {
  std::filesystem::create_directory(kPlace);
  for (const std::string& name : {std::string(250, 'k'), dots(2040) + "k"}) {
    useKeyFile(kPlace + name);
    SystemCalls::fail("O_TMPFILE", EOPNOTSUPP);
    EXPECT_EQ(encrypt("text"), std::nullopt);
    SystemCalls::release();
    expectOneLine(kPlace + name, kTooLong);
    EXPECT_THAT(filesIn(kPlace), IsEmpty());
  }
}

/// What processes share with the test.
struct Shared {
  static constexpr unsigned kRacers = 50;

  Shared() {
    pthread_barrierattr_t attributes;
    pthread_barrierattr_init(&attributes);
    pthread_barrierattr_setpshared(&attributes, PTHREAD_PROCESS_SHARED);
    pthread_barrier_init(&gate, &attributes, kRacers);
    pthread_barrierattr_destroy(&attributes);
  }

  pthread_barrier_t gate{};  // opens when all have arrived
  char ciphers[kRacers][64] = {};
};

class KeyRaceTest : public KeyCreationTest {
 protected:
  void SetUp() override {
    KeyCreationTest::SetUp();
    void* memory =
        ::mmap(nullptr, sizeof(Shared), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    ASSERT_NE(memory, MAP_FAILED);
    shared_ = new (memory) Shared;
  }
  void TearDown() override {
    ::munmap(shared_, sizeof(Shared));
    KeyCreationTest::TearDown();
  }

  void waitForAll() const { pthread_barrier_wait(&shared_->gate); }

  /// Each process encrypts the same text; `prepare` runs in it before.
  void race(const std::function<void()>& prepare) {
    std::vector<pid_t> racers;
    for (auto& cipher : shared_->ciphers) {
      racers.push_back(inProcess([&] {
        prepare();
        const std::string text = encrypt("text").value_or("failed");
        text.copy(cipher, sizeof cipher - 1);
        return text == "failed" ? 1 : 0;
      }));
    }
    for (const pid_t racer : racers) EXPECT_EQ(statusOf(racer), 0);
  }

  void expectOneKey() const {
    const std::string expected = seal(readFile(kKeyFile), "keldcore-1", "text");
    for (const auto& cipher : shared_->ciphers) EXPECT_EQ(cipher, expected);
    EXPECT_THAT(filesIn(kStateDir), ElementsAre("keldcore.key"));
    EXPECT_EQ(readFile(kKeyFile).size(), 64U);
  }

  Shared* shared_ = nullptr;
};

TEST_F(KeyRaceTest, FiftyProcessesThatStartTogetherAgreeOnOneKey) {
  for (int round = 0; round < 5; ++round) {
    removeAll();
    race([&] { waitForAll(); });
    expectOneKey();
  }
}

// Every one of them has a key of its own in hand, found nobody else's, and is
// about to publish it.
TEST_F(KeyRaceTest, FiftyProcessesThatPublishTogetherAgreeOnOneKey) {
  race([&] {
    SystemCalls::follow([&](const std::string& name) {
      if (name == "linkat") waitForAll();
      return 0;
    });
  });
  expectOneKey();
}

TEST_F(KeyCreationTest, KillAtAnyStepLeavesNoKeyOrAWholeOne) {
  int steps = 0;
  for (bool killed = true; killed; ++steps) {
    removeAll();
    killed = killWhereItStops(inProcess([&] {
      SystemCalls::stopAt(steps + 1);
      return encrypt("text").has_value() ? 0 : 1;
    }));
    EXPECT_THAT(filesIn(kStateDir), AnyOf(IsEmpty(), ElementsAre("keldcore.key")));
    expectNoneOrAll();
  }
  EXPECT_EQ(steps, 9) << "eight calls to die at, and a run that gets by";
}

TEST_F(KeyCreationTest, KillAtRandomMomentsLeavesNoKeyOrAWholeOne) {
  std::mt19937 random(1);
  std::uniform_int_distribution<int> microseconds(0, 400);
  for (int round = 0; round < 200; ++round) {
    removeAll();
    const pid_t child = inProcess([] { return encrypt("text").has_value() ? 0 : 1; });
    std::this_thread::sleep_for(std::chrono::microseconds(microseconds(random)));
    ::kill(child, SIGKILL);
    const int status = statusOf(child);
    EXPECT_TRUE(diedOfKill(status) || status == 0) << status;
    expectNoneOrAll();
  }
}

TEST_F(KeyCreationTest, NextProcessUsesTheKeyOfTheFirst) {
  const auto writer = [](const char* path) {
    return inProcess([path] { return writeFile(path, encrypt("text").value_or("failed")), 0; });
  };
  EXPECT_EQ(statusOf(writer("/tmp/first")), 0);
  EXPECT_EQ(statusOf(writer("/tmp/second")), 0);
  EXPECT_EQ(readFile("/tmp/first"), seal(readFile(kKeyFile), "keldcore-1", "text"));
  EXPECT_EQ(readFile("/tmp/second"), readFile("/tmp/first"));
}

}  // namespace
