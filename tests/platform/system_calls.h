// The system calls that make a key file: a test sees their order, and has them
// fail, wait, or end the process.

#ifndef KELDOAUTH_TESTS_PLATFORM_SYSTEM_CALLS_H
#define KELDOAUTH_TESTS_PLATFORM_SYSTEM_CALLS_H

#include <functional>
#include <string>
#include <vector>

class SystemCalls {
 public:
  /// Asked before each call of getentropy, fchmod, write, fsync, linkat, unlink
  /// and read, with its name: what errno to fail with, 0 for going on. fsync of
  /// a folder is named "fsync folder", an open for a file without a name
  /// "O_TMPFILE"; other opens are not asked about.
  using Script = std::function<int(const std::string& name)>;

  static void follow(Script script);
  /// All calls of `name` fail.
  static void fail(const std::string& name, int error);
  /// The process stops before the n-th call (1 is the next), for its parent to
  /// kill it there.
  static void stopAt(int nth);
  /// read and write move one byte per call.
  static void moveOneByte();
  /// secure_getenv answers as it does in a process with raised privileges.
  static void raisePrivileges();

  static std::vector<std::string> names();
  static void release();
};

#endif  // KELDOAUTH_TESTS_PLATFORM_SYSTEM_CALLS_H
