// Backup and restore while eight processes write.

#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <filesystem>
#include <optional>
#include <random>
#include <set>
#include <thread>

#include "stores/oauth_grantCode.h"
#include "stores/oauth_log.h"
#include "tests/load/processes.h"
#include "tests/operations/operations.h"
#include "tests/support/long_form.h"
#include "utils/oauth_names.h"

namespace operations {
namespace {

namespace fs = std::filesystem;
namespace names = KELDOAUTHSERVER::names;
using support::Row;

constexpr int kWriters = 8;

/// How far each writer came. It writes the code of a serial, then the log entry
/// of the same serial.
struct Progress {
  std::array<std::atomic<int>, kWriters> begun{};
  std::array<std::atomic<int>, kWriters> done{};
  std::array<std::atomic<int>, kWriters> lastFailure{};
  std::array<std::atomic<int>, kWriters> failures{};
  std::atomic<bool> isOver{false};
};

/// "3.000017", writer and serial.
std::string nameOf(int writer, int serial) {
  const std::string digits = std::to_string(serial);
  return std::to_string(writer) + "." + std::string(6 - digits.size(), '0') + digits;
}

bool writePair(KELDOAUTHSERVER::OAUTHDBBasic& failed, const std::string& name) {
  Json::Value out;
  KELDOAUTHSERVER::OAUTHDBGrantCode codes(names::kGrantCodeTable);
  const std::string client(64, 'c');
  if (codes.Add(name, client, "read", "state", "192.0.2.1", out) == 0) {
    failed.SetErrCode(codes.GetErrCode());
    return false;
  }
  return true;
}

/// One half of the writers keeps its log open all the time.
void writeUntilOver(Progress& progress, int writer) {
  KELDOAUTHSERVER::OAUTHDBLog log(names::kLogTable);
  for (int serial = 1; !progress.isOver; ++serial) {
    const auto number = static_cast<std::size_t>(writer);
    const std::string name = nameOf(writer, serial);
    progress.begun[number] = serial;
    if (writePair(log, name) && log.Add(name) != 0) {
      progress.done[number] = serial;
      continue;
    }
    progress.lastFailure[number] = log.GetErrCode();
    ++progress.failures[number];
  }
}

class Crowds : public Operations {
 protected:
  void SetUp() override {
    Operations::SetUp();
    writeSettings(R"({"grantcode_max": 10000, "log_max": 10000})");
    expectNextProgramReady();
  }

  /// Once, or in the long form again and again: a store is full at some time.
  template <typename Body>
  void onFreshStores(Body body) {
    const int stores = support::isLongForm() ? 40 : 1;
    for (int store = 0; store < stores && !HasFailure(); ++store) {
      TearDown();
      SetUp();
      progress_.emplace();
      body();
    }
    RecordProperty("stores", stores);
    RecordProperty("kills", kills_);
  }

  /// Lets the writers in, runs `body` in this process, and sends them away.
  template <typename Body>
  void whileTheyWrite(Body body) {
    const bool allEnded = load::runProcesses(
        kWriters, [&](int number) { writeUntilOver(*progress().operator->(), number); },
        [&] {
          waitForEachWriter();
          body();
          progress()->isOver = true;
        });
    EXPECT_TRUE(allEnded);
  }

  load::Shared<Progress>& progress() { return *progress_; }

  /// Until each has written two pairs more.
  void waitForEachWriter() {
    const Serials now = copyOf(progress()->done);
    for (std::size_t number = 0; number < kWriters; ++number) {
      while (progress()->done[number] < now[number] + 2) std::this_thread::yield();
    }
  }

  using Serials = std::array<int, kWriters>;

  static Serials copyOf(const std::array<std::atomic<int>, kWriters>& counts) {
    Serials serials{};
    std::copy(counts.begin(), counts.end(), serials.begin());
    return serials;
  }

  static std::set<std::string> texts(const std::vector<Row>& rows, const char* column) {
    std::set<std::string> found;
    for (const Row& row : rows) found.insert(row.at(column));
    return found;
  }

  /// For each writer all pairs up to one between the two, and perhaps the code
  /// of the one after it.
  static void expectPrefixes(const Content& content, const Serials& least, const Serials& most) {
    const auto codes = texts(content.at(names::kGrantCodeTable), names::kUsername);
    const auto entries = texts(content.at(names::kLogTable), names::kMsg);
    std::size_t expectedEntries = 0;
    std::size_t expectedCodes = 0;
    for (int writer = 0; writer < kWriters; ++writer) {
      const auto number = static_cast<std::size_t>(writer);
      int serial = 0;
      while (entries.count(nameOf(writer, serial + 1)) != 0) ++serial;
      EXPECT_GE(serial, least[number]) << "an acknowledged row of writer " << writer << " is lost";
      EXPECT_LE(serial, most[number]);
      for (int code = 1; code <= serial; ++code) {
        EXPECT_EQ(codes.count(nameOf(writer, code)), 1U) << "a later row without an earlier one";
      }
      expectedEntries += static_cast<std::size_t>(serial);
      expectedCodes += static_cast<std::size_t>(serial) + codes.count(nameOf(writer, serial + 1));
    }
    EXPECT_EQ(entries.size(), expectedEntries) << "a gap before some row";
    EXPECT_EQ(codes.size(), expectedCodes);
  }

  static std::set<int> serialsOf(const std::set<std::string>& names, int writer) {
    std::set<int> serials;
    for (const std::string& name : names) {
      if (name.rfind(std::to_string(writer) + ".", 0) == 0) {
        serials.insert(std::stoi(name.substr(name.find('.') + 1)));
      }
    }
    return serials;
  }

  /// Of an empty copy: rows up to `gone` went, and from some row before `kept`
  /// on each one is there.
  void expectSuffixes(const Content& content, const Serials& gone, const Serials& kept) {
    const auto codes = texts(content.at(names::kGrantCodeTable), names::kUsername);
    const auto entries = texts(content.at(names::kLogTable), names::kMsg);
    for (int writer = 0; writer < kWriters; ++writer) {
      const auto number = static_cast<std::size_t>(writer);
      for (const std::set<int>& serials : {serialsOf(codes, writer), serialsOf(entries, writer)}) {
        ASSERT_FALSE(serials.empty());
        const int first = *serials.begin();
        const int last = progress()->done[number];
        EXPECT_GE(first, gone[number]) << "a row from before the restore";
        EXPECT_LE(first, kept[number] + 1) << "a row from after the restore is lost";
        EXPECT_GE(*serials.rbegin(), last);
        EXPECT_EQ(static_cast<int>(serials.size()), *serials.rbegin() - first + 1) << "a gap";
      }
    }
  }

  void expectNoFailures() {
    for (const auto& failures : progress()->failures) EXPECT_EQ(failures, 0);
  }

  /// Runs a command to its end, and learns how long it takes in this crowd.
  void timeIt(const Arguments& arguments) {
    const auto start = std::chrono::steady_clock::now();
    EXPECT_THAT(run(arguments), ExitsWith(cli::kOk));
    takes_ = std::chrono::duration_cast<std::chrono::microseconds>(
        std::chrono::steady_clock::now() - start);
  }

  /// Starts a command and kills it at some moment of the time that it takes.
  void killSoon(const Arguments& arguments) {
    const int command = load::startProcess([&] {
      setpgid(0, 0);
      run(arguments);
    });
    std::uniform_int_distribution<long long> moment(0, takes_.count());
    std::this_thread::sleep_for(std::chrono::microseconds(moment(random_)));
    kill(-command, SIGKILL);
    kill(command, SIGKILL);
    int status = 0;
    waitpid(command, &status, 0);
    if (WIFSIGNALED(status)) ++kills_;
  }

  std::chrono::microseconds takes_{};
  int kills_ = 0;
  std::mt19937 random_{support::isLongForm() ? std::random_device()() : 1U};
  std::optional<load::Shared<Progress>> progress_;
};

TEST_F(Crowds, BackupHasAllThatWasAcknowledgedBeforeItBegan) {
  onFreshStores([&] {
    constexpr int kRounds = 8;
    whileTheyWrite([&] {
      for (int round = 0; round < kRounds && !HasFailure(); ++round) {
        const Serials least = copyOf(progress()->done);
        ASSERT_THAT(backUp(), ExitsWith(cli::kOk));
        const Serials most = copyOf(progress()->begun);
        expectPrivate(kCopies);
        expectPrefixes(contentOf(kCopy), least, most);
        fs::remove(kCopy);
      }
    });
    expectNoFailures();
  });
}

TEST_F(Crowds, KilledBackupsDisturbNobodyAndLeaveNoHalfCopy) {
  onFreshStores([&] {
    constexpr int kRounds = 30;
    whileTheyWrite([&] {
      timeIt({"backup", kCopy});
      putBack(kCopies, {});
      for (int round = 0; round < kRounds && !HasFailure(); ++round) {
        const Serials least = copyOf(progress()->done);
        killSoon({"backup", kCopy});
        expectPrivate(kCopies);
        if (fs::exists(kCopy)) {
          expectPrefixes(contentOf(kCopy), least, copyOf(progress()->begun));
        }
        putBack(kCopies, {});
      }
    });
    expectNoFailures();
    EXPECT_GT(kills_, 0);
    expectPrefixes(contentOf(), copyOf(progress()->done), copyOf(progress()->begun));
  });
}

TEST_F(Crowds, KilledRestoresLeaveASoundStore) {
  onFreshStores([&] {
    constexpr int kRounds = 30;
    backUp();
    whileTheyWrite([&] {
      timeIt({"restore", "--yes", kCopy});
      for (int round = 0; round < kRounds && !HasFailure(); ++round) {
        killSoon({"restore", "--yes", kCopy});
        expectNextProgramReady();
        contentOf();
        expectPrivate(kStateDir);
      }
    });
    expectNoFailures();
    EXPECT_GT(kills_, 0);
  });
}

TEST_F(Crowds, RestoreTakesWhatWasThereAndNothingThatComes) {
  onFreshStores([&] {
    constexpr int kRounds = 4;
    backUp();
    Serials gone{};
    Serials kept{};
    whileTheyWrite([&] {
      for (int round = 0; round < kRounds; ++round) {
        gone = copyOf(progress()->done);
        EXPECT_THAT(restore(), ExitsWith(cli::kOk));
        kept = copyOf(progress()->begun);
        waitForEachWriter();
      }
    });
    expectNoFailures();
    expectSuffixes(contentOf(), gone, kept);
  });
}

}  // namespace
}  // namespace operations
