// The fixture of the stand-in cipher: an empty state folder without a key, and
// the functions of the built library itself rather than their doubles.

#ifndef KELDOAUTH_TESTS_PLATFORM_PLATFORM_TEST_H
#define KELDOAUTH_TESTS_PLATFORM_PLATFORM_TEST_H

#include <dlfcn.h>

#include <optional>
#include <string>
#include <vector>

#include "tests/support/world.h"

/// A function of a built stand-in, past the doubles.
template <typename Function>
Function* standIn(const char* name) {
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

/// What a call of the cipher wrote; nothing when it returned 0.
using Text = std::optional<std::string>;

class CipherTest : public support::World {
 protected:
  static constexpr char kKeyFile[] = "/var/packages/Corvane/target/etc/keldcore.key";
  static constexpr std::size_t kBuffer = 1024;

  void SetUp() override;
  void TearDown() override;

  /// The bytes 0 to 63.
  static std::string countingKey();
  /// Renames a file with these bytes into place.
  static void putKey(const std::string& key, const std::string& path = kKeyFile,
                     unsigned mode = 0600);
  /// KELDCORE_KEY_FILE names this file from now on.
  static void useKeyFile(const std::string& path);
  static unsigned modeOf(const std::string& path);
  /// The names in the folder, sorted.
  static std::vector<std::string> filesIn(const std::string& folder);

  /// The log has this line alone, as an error; forgets it.
  static void expectOneLine(const std::string& path, const std::string& reason);

  /// A byte behind the buffer is watched.
  static Text encrypt(const std::string& text, std::size_t size = kBuffer);
  static Text decrypt(const std::string& cipher, std::size_t size = kBuffer);

  /// A ciphertext made beside the library: with any label, of any bytes.
  static std::string seal(const std::string& key, const std::string& label,
                          const std::string& text);
};

#endif  // KELDOAUTH_TESTS_PLATFORM_PLATFORM_TEST_H
