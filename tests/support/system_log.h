// What the program under test wrote to the system log. Linking this file takes
// the place of the C library's syslog for the whole process.

#ifndef KELDOAUTH_TESTS_SUPPORT_SYSTEM_LOG_H
#define KELDOAUTH_TESTS_SUPPORT_SYSTEM_LOG_H

#include <string>
#include <vector>

namespace support {

struct LogLine {
  int priority;
  std::string format;  // as the caller passed it
  std::string text;    // as a reader of the log sees it
  int error = 0;       // errno as the caller left it

  /// The text before the first ":".
  [[nodiscard]] std::string source() const;
  /// The line number behind it.
  [[nodiscard]] int number() const;
  /// The text after "source:line ".
  [[nodiscard]] std::string message() const;
};

class SystemLog {
 public:
  static void clear();
  static std::vector<LogLine> lines();

  /// The texts, source and line number included.
  static std::vector<std::string> texts();
  /// The texts without source and line number.
  static std::vector<std::string> messages();
  /// How many lines have this message (without source and line number).
  static int count(const std::string& message);
};

}  // namespace support

#endif  // KELDOAUTH_TESTS_SUPPORT_SYSTEM_LOG_H
