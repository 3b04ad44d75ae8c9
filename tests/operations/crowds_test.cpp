// Backup and restore while eight processes write.

#include <signal.h>
#include <sqlite3.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <filesystem>
#include <numeric>
#include <optional>
#include <random>
#include <set>
#include <thread>

#include "core/oauth_errors.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_log.h"
#include "tests/load/processes.h"
#include "tests/operations/operations_test.h"
#include "tests/support/long_form.h"
#include "utils/oauth_names.h"

namespace operations {
namespace {

namespace fs = std::filesystem;
namespace errors = KELDOAUTHSERVER::errors;
namespace names = KELDOAUTHSERVER::names;
using support::Row;

constexpr int kWriters = 8;
constexpr int kRowMax = 10000;

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

/// 0, or why it could not be written.
int writeCode(const std::string& name) {
  Json::Value out;
  KELDOAUTHSERVER::OAUTHDBGrantCode codes(names::kGrantCodeTable);
  const std::string client(64, 'c');
  const bool written = codes.Add(name, client, "read", "state", "192.0.2.1", out) != 0;
  return written ? SQLITE_OK : codes.GetErrCode();
}

int writeEntry(KELDOAUTHSERVER::OAUTHDBLog& log, const std::string& name) {
  return log.Add(name) != 0 ? SQLITE_OK : log.GetErrCode();
}

/// Whether nothing worse happened than that the lock was not to be had for as
/// long as a statement waits: where the disk is slow, eight writers leave one of
/// them without its turn. A count that had none makes the table read as full,
/// which none is before that many rows were begun.
bool hadNoTurn(const Progress& progress, int code) {
  if (code != errors::kGrantCodeFull.code) return code == SQLITE_BUSY;
  return std::accumulate(progress.begun.begin(), progress.begun.end(), 0) < kRowMax;
}

/// Writes until that succeeds, or all is over. Who had no turn asks again.
template <typename Write>
bool isWritten(Progress& progress, std::size_t writer, Write write) {
  int code = write();
  while (hadNoTurn(progress, code) && !progress.isOver) code = write();
  if (code == SQLITE_OK) return true;
  if (!hadNoTurn(progress, code)) {
    progress.lastFailure[writer] = code;
    ++progress.failures[writer];
  }
  return false;
}

/// Keeps its log open all the time, and opens the codes for each of them.
void writeUntilOver(Progress& progress, int writer) {
  std::optional<KELDOAUTHSERVER::OAUTHDBLog> log;
  do {
    log.emplace(names::kLogTable);
  } while (log->GetErrCode() != errors::kNone.code && !progress.isOver);

  const auto number = static_cast<std::size_t>(writer);
  for (int serial = 1; !progress.isOver; ++serial) {
    const std::string name = nameOf(writer, serial);
    progress.begun[number] = serial;
    if (!isWritten(progress, number, [&] { return writeCode(name); })) return;
    if (!isWritten(progress, number, [&] { return writeEntry(*log, name); })) return;
    progress.done[number] = serial;
  }
}

class Crowds : public Operations {
 protected:
  void SetUp() override {
    Operations::SetUp();
    const std::string most = std::to_string(kRowMax);
    writeSettings(R"({"grantcode_max": )" + most + R"(, "log_max": )" + most + "}");
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
      while (progress()->done[number] < now[number] + 2 && isEachWell()) {
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
      }
    }
  }

  /// Until one of them, who opens a store for each code, has written a pair more.
  void waitForSomeWriter() {
    const Serials now = copyOf(progress()->done);
    while (copyOf(progress()->done) == now && isEachWell()) {
      std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
  }

  /// A writer whose write failed is gone, and must not be waited for.
  bool isEachWell() { return copyOf(progress()->failures) == Serials{}; }

  /// Runs a command to its end. Like a writer, it asks again when it had no turn.
  static Outcome insist(const Arguments& arguments) {
    Outcome outcome = run(arguments);
    while (outcome.err.find("database is locked (5)\n") != std::string::npos) {
      outcome = run(arguments);
    }
    return outcome;
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
    for (std::size_t number = 0; number < kWriters; ++number) {
      EXPECT_EQ(progress()->failures[number], 0)
          << "code " << progress()->lastFailure[number] << " for writer " << number;
    }
  }

  /// Runs a command to its end, and learns how long it takes in this crowd.
  void timeIt(const Arguments& arguments) {
    const auto start = std::chrono::steady_clock::now();
    EXPECT_THAT(insist(arguments), ExitsWith(cli::kOk));
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
        ASSERT_THAT(insist({"backup", kCopy}), ExitsWith(cli::kOk));
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
        contentOf();
        waitForSomeWriter();
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
        EXPECT_THAT(insist({"restore", "--yes", kCopy}), ExitsWith(cli::kOk));
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
