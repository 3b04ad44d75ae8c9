// The fixture of every test that lets the library work on its real paths: an
// empty state folder, default settings, diagnostics off, real clock and ids.

#ifndef KELDOAUTH_TESTS_SUPPORT_WORLD_H
#define KELDOAUTH_TESTS_SUPPORT_WORLD_H

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <json/value.h>

#include <functional>
#include <map>
#include <string>
#include <vector>

#include "tests/support/doubles.h"
#include "tests/support/system_log.h"

namespace support {

/// A row as SQLite itself has it, ciphertext and all; NULL reads as "<NULL>".
using Row = std::map<std::string, std::string>;

class World : public ::testing::Test {
 protected:
  void SetUp() override;
  void TearDown() override;

  static constexpr char kStateDir[] = "/var/packages/Corvane/target/etc";
  static constexpr char kDatabase[] = "/var/packages/Corvane/target/etc/oauth.db";
  static constexpr char kSettings[] = "/var/packages/Corvane/target/etc/oauth.cfg";
  static constexpr char kFlagFile[] = "/tmp/keldoauth_debug";

  static void writeFile(const std::string& path, const std::string& text);
  static std::string readFile(const std::string& path);

  /// Replaces the settings file, with any text.
  static void writeSettings(const std::string& text);

  /// Runs `body` in a thread that has not asked for the diagnostic switches
  /// yet, with the flag file present and `level` as "log_level" (beside
  /// `otherSettings`, members such as "\"log_max\": 3").
  static void withDiagnostics(int level, const std::function<void()>& body,
                              const std::string& otherSettings = "");
  /// The same without touching flag file and settings.
  static void inFreshThread(const std::function<void()>& body);

  /// Runs a statement on a connection of the test's own and returns its rows.
  /// A statement that fails fails the test.
  static std::vector<Row> sql(const std::string& statement);
  /// The first column of the first row; empty without one.
  static std::string sqlText(const std::string& statement);
};

/// 64 characters made of one, for identifiers, codes and tokens.
inline std::string id64(char c) {
  return std::string(64, c);
}

}  // namespace support

#endif  // KELDOAUTH_TESTS_SUPPORT_WORLD_H
