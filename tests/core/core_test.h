// What the cases of the storage core share: an object on a table, the log lines
// that it writes, and a way to run its operations with diagnostics on.

#ifndef KELDOAUTH_TESTS_CORE_CORE_TEST_H
#define KELDOAUTH_TESTS_CORE_CORE_TEST_H

#include <json/value.h>
#include <json/writer.h>

#include <functional>
#include <optional>
#include <ostream>
#include <string>
#include <vector>

#include "core/oauth_db_basic.h"
#include "tests/core/engine.h"
#include "tests/support/world.h"
#include "utils/oauth_names.h"

namespace core_tests {

constexpr int kError = 3;

/// A line of the storage core.
struct Line {
  int priority;
  std::string format;  // without "%s:%d "
  std::string message;
};
bool operator==(const Line& a, const Line& b);
std::ostream& operator<<(std::ostream& out, const Line& line);

/// A failure line without arguments: its text is its format.
Line plain(const std::string& text);
/// The line of a statement that the engine refused.
Line runFailed(const std::string& text, int code);

/// An object on a table, as the stores are.
class Table : public KELDOAUTHSERVER::OAUTHDBBasic {
 public:
  explicit Table(const std::string& name) { SetTabName(name); }
};

/// "{'a': '1'}" with single quotes for double ones.
Json::Value json(std::string text);

class CoreTest : public support::World {
 protected:
  void SetUp() override;
  void TearDown() override;

  /// The lines since the last clear. Each must name the core's source and a
  /// line number in it.
  static std::vector<Line> lines();
  static std::vector<std::string> messages();

  /// What `operation` writes, by message, with diagnostics at `level`.
  static std::vector<std::string> traced(int level, const std::function<void()>& operation);
  static std::vector<Line> tracedLines(int level, const std::function<void()>& operation);

  /// Makes CREATE TABLE `name` fail: an index of that name is there.
  static void blockTable(const std::string& name);
  static std::string blocked(const std::string& name);  // SQLite's text for it

  /// Moves the folder of the database out of the way.
  static void hideFolder();
  static void showFolder();
};

/// Nothing failed on `store`, ever.
void expectNoError(const KELDOAUTHSERVER::OAUTHDBBasic& store);
void expectError(const KELDOAUTHSERVER::OAUTHDBBasic& store, int code, const std::string& msg);

}  // namespace core_tests

#endif  // KELDOAUTH_TESTS_CORE_CORE_TEST_H
