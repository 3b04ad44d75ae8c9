// Runs the built command line as a user would: arguments, standard input or a
// terminal, and what comes back.

#ifndef KELDOAUTH_TESTS_TOOLS_CLI_H
#define KELDOAUTH_TESTS_TOOLS_CLI_H

#include <json/value.h>

#include <functional>
#include <string>
#include <vector>

#include "tests/support/world.h"

namespace cli {

using Arguments = std::vector<std::string>;

/// The statuses of the manual page.
enum Exit : int {
  kOk = 0,
  kUsage = 1,
  kRefused = 2,
  kNotFound = 3,
  kUnavailable = 4,
  kInvalid = 5,
  kUnhealthy = 6,
  kNotConfirmed = 7,
  kNotWritten = 8,
};

struct Outcome {
  int exit = -1;
  std::string out;
  std::string err;
};

inline void PrintTo(const Outcome& outcome, std::ostream* stream) {
  *stream << "exit " << outcome.exit << "\nout: " << outcome.out << "\nerr: " << outcome.err;
}

/// An answer to a prompt: typed as soon as `prompt` has been shown and
/// `meanwhile`, if there is one, has returned.
struct Typed {
  std::string prompt;
  std::string text;
  std::function<void()> meanwhile = {};
};

class CliTest : public support::World {
 protected:
  void SetUp() override;

  /// Standard input is a file with `input`.
  static Outcome run(const Arguments& arguments, const std::string& input = {});
  /// The same as user and group kNobody, without any privilege.
  static Outcome runAsNobody(const Arguments& arguments);
  /// Standard output goes to the file `path`.
  static Outcome runInto(const std::string& path, const Arguments& arguments);
  /// On a terminal of `columns` columns. `out` is what the terminal shows,
  /// standard error included, with plain line ends.
  /// A program that waits for more than is typed is killed after a while.
  static Outcome runOnTerminal(const Arguments& arguments, const std::vector<Typed>& typed = {},
                               unsigned short columns = 80);

  /// Any program. The first word is its path.
  static Outcome runProgram(const Arguments& words);

  /// Eight times the same at the same moment, all with `input`. `out` and `err`
  /// have what all of them wrote.
  static Outcome runEightTimes(const Arguments& arguments, const std::string& input);

  /// Runs with --json and checks that exactly one document came out and that
  /// the exit status is `exit`.
  static Json::Value json(Arguments arguments, const std::string& input = {}, int exit = kOk);

  /// An empty store, as the service's first use leaves it.
  static void makeStore();

  /// Registers a client and returns the answer's "client".
  static Json::Value addClient(const std::string& name = "Photo Frame");
  /// Issues to client 1, which must exist; `more` are further arguments.
  static Json::Value issueCode(const Arguments& more = {});
  static Json::Value issueToken(const Arguments& more = {});

  /// Rows in the clear for client 1, as another program stores them. The code,
  /// and the pair of tokens.
  static std::string storeForeignCode(const std::string& username = "alice",
                                      const std::string& scope = "photos");
  static Json::Value storeForeignToken(const std::string& username = "alice",
                                       const std::string& scope = "photos");
  /// Copies of row 1 of a table of codes or tokens, with ids up to `rows`.
  static void multiply(const std::string& table, int rows);

  /// Moves the expiry of a row to `seconds` from now.
  static void expireIn(const std::string& table, int id, long long seconds);
  static std::string rowCount(const std::string& table);

 private:
  static Outcome collect(int exit);
};

inline constexpr unsigned int kNobody = 65534;

/// The words that start `program`. Programs for another processor need their
/// emulator in front, also when they are started from an emulated one.
Arguments commandLine(const std::string& program, const Arguments& arguments);

/// False in the namespace of an ordinary user, who is alone there.
bool canBecomeNobody();

/// While it lives the state folder does not exist.
class HiddenFolder {
 public:
  HiddenFolder();
  ~HiddenFolder();
  HiddenFolder(const HiddenFolder&) = delete;
  HiddenFolder& operator=(const HiddenFolder&) = delete;
};

/// While it lives nobody can write in the state folder.
class ReadOnlyFolder {
 public:
  ReadOnlyFolder();
  ~ReadOnlyFolder();
  ReadOnlyFolder(const ReadOnlyFolder&) = delete;
  ReadOnlyFolder& operator=(const ReadOnlyFolder&) = delete;
};

/// `text` in lines, without their ends.
std::vector<std::string> lines(const std::string& text);

inline constexpr char kMask[] = "…";

MATCHER_P(ExitsWith, status, "") {
  return arg.exit == status;
}

}  // namespace cli

#endif  // KELDOAUTH_TESTS_TOOLS_CLI_H
