// Backup, restore and rekey as an operator would run them, and as they are when
// the machine stops half way.

#ifndef KELDOAUTH_TESTS_OPERATIONS_OPERATIONS_TEST_H
#define KELDOAUTH_TESTS_OPERATIONS_OPERATIONS_TEST_H

#include <sys/types.h>

#include <map>
#include <string>
#include <vector>

#include "tests/tools/cli.h"

namespace operations {

using cli::Arguments;
using cli::ExitsWith;
using cli::Outcome;

/// The rows of each table of a file.
using Content = std::map<std::string, std::vector<support::Row>>;

class Operations : public cli::CliTest {
 protected:
  static constexpr char kCopies[] = "/tmp/copies";
  static constexpr char kCopy[] = "/tmp/copies/copy.db";
  static constexpr char kKey[] = "/var/packages/Corvane/target/etc/keldcore.key";
  static constexpr char kNextKey[] = "/var/packages/Corvane/target/etc/keldcore.key.next";
  static constexpr char kJournal[] = "/var/packages/Corvane/target/etc/oauth.db-journal";

  /// An open umask: what is private is so by the program's own doing.
  void SetUp() override;
  void TearDown() override;

  /// Some rows in every table, their texts made from `name`.
  static void furnish(const std::string& name = "first");

  static Outcome backUp(const std::string& path = kCopy);
  static Outcome restore(const std::string& path = kCopy);

  /// How the n-th step of a command ends it.
  enum class Death { kBeforeTheStep, kWithinTheStep };
  /// Runs a command until its n-th step; exits with -SIGKILL, or as usual when
  /// it takes fewer steps.
  static Outcome dieAt(int nth, Death death, const Arguments& arguments);
  /// What becomes of a step that reports an error of the disk.
  enum class Failing { kUndone, kDone };
  /// Runs a command to its end; its n-th step fails.
  static Outcome failAt(int nth, Failing how, const Arguments& arguments);
  /// Runs a command as often as it has steps, and in either way; `check` gets
  /// the outcome.
  template <typename Prepare, typename Check>
  static void failAtEachStep(const Arguments& arguments, Prepare prepare, Check check);
  /// Every sync of a folder fails.
  static Outcome withoutFolderSync(const Arguments& arguments);

  /// The same without an end; waiting for locks takes no time.
  static Outcome hurry(const Arguments& arguments);
  /// Runs a command to its end, and a line of the shell before its n-th step.
  static Outcome meanwhile(int nth, const std::string& line, const Arguments& arguments);
  /// The steps of a command that runs to its end.
  static std::vector<std::string> stepsOf(const Arguments& arguments);

  /// Runs a command once for each of its steps and lets it die there; calls
  /// `prepare` before and `check` after each. Returns the number of steps.
  /// Where programs are emulated, and slow to start, it dies once per step.
  template <typename Prepare, typename Check>
  static int dieAtEachStep(const Arguments& arguments, Prepare prepare, Check check);

  /// Rolls back what a crash left. Expects that the file is sound. Without the
  /// entries of restore and rekey in the audit log.
  static Content contentOf(const std::string& path = kDatabase);
  static void execute(const std::string& path, const std::string& sql);
  static std::string valueIn(const std::string& path, const std::string& sql);

  /// A program of the service dies while it writes a row: leaves a database that
  /// nobody may read without its journal. Returns what is to survive.
  static Content crashWhileWriting();

  /// What stands in a folder, by name.
  static std::map<std::string, std::string> filesIn(const std::string& folder);
  static void putBack(const std::string& folder, const std::map<std::string, std::string>& files);
  /// Every file that is made anew there; the settings were made by hand.
  static void expectPrivate(const std::string& folder);

  /// A program of the service starts and finds a store.
  static void expectNextProgramReady();

 private:
  static std::vector<Death> deathsAt(int step);

  mode_t umask_ = 0;
};

template <typename Prepare, typename Check>
int Operations::dieAtEachStep(const Arguments& arguments, Prepare prepare, Check check) {
  for (int nth = 1; !HasFailure(); ++nth) {
    for (const Death death : deathsAt(nth)) {
      SCOPED_TRACE("step " + std::to_string(nth) +
                   (death == Death::kWithinTheStep ? ", torn" : ""));
      prepare();
      const Outcome outcome = dieAt(nth, death, arguments);
      if (outcome.exit == cli::kOk) return nth - 1;
      EXPECT_EQ(outcome.exit, -9) << outcome.err;
      check();
    }
  }
  return 0;
}

template <typename Prepare, typename Check>
void Operations::failAtEachStep(const Arguments& arguments, Prepare prepare, Check check) {
  prepare();
  const auto steps = static_cast<int>(stepsOf(arguments).size());
  for (int nth = 1; nth <= steps && !HasFailure(); ++nth) {
    for (const Failing how : {Failing::kUndone, Failing::kDone}) {
      SCOPED_TRACE("step " + std::to_string(nth) + (how == Failing::kDone ? ", done" : ""));
      prepare();
      check(failAt(nth, how, arguments));
    }
  }
}

}  // namespace operations

#endif  // KELDOAUTH_TESTS_OPERATIONS_OPERATIONS_TEST_H
