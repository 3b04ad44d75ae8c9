// The system calls that make a key file: a test sees their order, and has them
// fail, or the process die there.

#ifndef KELDOAUTH_TESTS_SIGNING_CALLS_H
#define KELDOAUTH_TESTS_SIGNING_CALLS_H

#include <functional>
#include <string>
#include <vector>

namespace signing_test {

class Calls {
 public:
  /// Asked before each call of getentropy, fchown, fchmod, write, fsync, link,
  /// rename, unlink and flock, and each open of a file to be created ("create"):
  /// what errno to fail with, 0 for going on. fsync of a folder is named "fsync
  /// folder".
  using Script = std::function<int(const std::string& name)>;

  static void follow(Script script);
  /// All calls of `name` fail.
  static void fail(const std::string& name, int error);
  /// write moves one byte per call.
  static void writeOneByte();

  static std::vector<std::string> names();
  static void release();
};

}  // namespace signing_test

#endif  // KELDOAUTH_TESTS_SIGNING_CALLS_H
