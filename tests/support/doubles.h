// The world around the library, as far as a test wants to have its way with it:
// the clock, the platform's cipher and address, the ids of the process. What a
// test does not touch behaves as it really is.

#ifndef KELDOAUTH_TESTS_SUPPORT_DOUBLES_H
#define KELDOAUTH_TESTS_SUPPORT_DOUBLES_H

#include <cstddef>
#include <functional>
#include <string>
#include <vector>

namespace support {

/// time() for the library, and the clock that SQLite's "now" reads.
class Clock {
 public:
  static void setTo(long long seconds);
  static void advance(long long seconds);
  static void release();
  /// Runs `body` at every call of time(), until the release.
  static void onRead(std::function<void()> body);
  /// Calls of time() since the last release.
  static int calls();
};

/// libkeldcore and libkeldcgi.
class Platform {
 public:
  using Cipher = std::function<int(const char* text, char* out, std::size_t outSize)>;
  using Address = std::function<int(char* buffer, std::size_t size)>;

  /// Replaces the cipher, or the source of the address, until the release.
  static void useCipher(Cipher encrypt, Cipher decrypt);
  static void useAddress(Address address);
  /// A cipher that a test can read: "abc" becomes "<abc>", and nothing else
  /// decrypts.
  static void useReadableCipher();

  /// The n-th call from now on (1 is the next) and all after it return 0.
  static void failEncryptFrom(int call);
  static void failDecryptFrom(int call);
  /// KeldCgiGetRemoteIP writes `text`, cut to the buffer, and returns `result`.
  static void answerRemoteIp(const std::string& text, int result = 0);
  static void release();
  /// Clear texts handed to the cipher since the last release.
  static std::vector<std::string> encrypted();
  static std::vector<std::string> decrypted();
};

/// Effective ids that exist only for this process's calls of geteuid, getegid,
/// setresuid and setresgid.
class FakeIds {
 public:
  static void use(int euid, int egid);
  /// Every setresuid (or setresgid) that asks for `id` fails with `error`.
  static void refuseUid(int id, int error);
  static void refuseGid(int id, int error);
  /// The n-th switch from now on (1 is the next), of user or group, fails.
  static void refuseCall(int nth, int error);
  static void release();
  static int euid();
  static int egid();
  /// "setresgid(-1, 0, -1)" and so on, in order.
  static std::vector<std::string> calls();
};

}  // namespace support

#endif  // KELDOAUTH_TESTS_SUPPORT_DOUBLES_H
