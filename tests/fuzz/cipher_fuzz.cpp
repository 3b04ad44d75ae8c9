// Any text for the stand-in cipher to decrypt, and to encrypt. The input: two
// bytes for the size of the buffer, then the text.

#include <sys/stat.h>

#include <algorithm>
#include <cctype>
#include <cstdint>
#include <cstdlib>
#include <fstream>
#include <memory>
#include <string>

#include "platform/keldcore.h"
#include "tests/fuzz/expect.h"
#include "tests/support/private_mounts.h"

namespace {

using fuzz::expect;

/// The same key in every run, so that the corpus holds texts that decrypt.
bool useKnownKey() {
  support::requirePrivateMounts();
  constexpr char kPath[] = "/tmp/fuzz.key";
  std::string key(64, '\0');
  for (std::size_t i = 0; i < key.size(); ++i) key[i] = static_cast<char>(i);
  std::ofstream(kPath, std::ios::binary) << key;
  return chmod(kPath, 0600) == 0 && setenv("KELDCORE_KEY_FILE", kPath, 1) == 0;
}

/// A buffer of exactly the size, so that writing behind it is seen.
struct Buffer {
  explicit Buffer(std::size_t bytes) : size(bytes), text(new char[bytes]) {
    std::fill_n(text.get(), size, '!');
  }
  [[nodiscard]] bool isTerminated() const {
    return std::find(text.get(), text.get() + size, '\0') != text.get() + size;
  }

  std::size_t size;
  std::unique_ptr<char[]> text;
};

std::string encrypted(const std::string& clear) {
  Buffer out(8192);
  const int done = KCORECryptSzEncrypt(clear.c_str(), out.text.get(), out.size);
  return done != 0 ? out.text.get() : "";
}

/// Nothing decrypts but what was encrypted.
void checkDecryption(const std::string& text, std::size_t size) {
  Buffer out(size);
  if (KCORECryptSzDecrypt(text.c_str(), out.text.get(), out.size) == 0) return;
  expect(out.isTerminated(), "the end of a clear text", text);
  expect(encrypted(out.text.get()) == text, "a text that nobody encrypted", text);
}

void checkEncryption(const std::string& text, std::size_t size) {
  Buffer out(size);
  if (KCORECryptSzEncrypt(text.c_str(), out.text.get(), out.size) == 0) return;
  expect(out.isTerminated(), "the end of a ciphertext", text);
  const std::string cipher = out.text.get();
  expect(std::all_of(cipher.begin(), cipher.end(),
                     [](unsigned char c) { return std::isgraph(c) != 0; }),
         "a ciphertext that cannot be printed", cipher);

  Buffer clear(8192);
  expect(KCORECryptSzDecrypt(cipher.c_str(), clear.text.get(), clear.size) != 0, "the way back");
  expect(text == clear.text.get(), "the text after the way back", clear.text.get());
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const bool hasKey = useKnownKey();
  expect(hasKey, "the key file");
  if (size < 2) return 0;
  const std::size_t bufferSize = (data[0] + 256U * data[1]) % 4096;
  // The text ends with its first NUL byte.
  const std::string text = std::string(reinterpret_cast<const char*>(data) + 2, size - 2).c_str();
  checkDecryption(text, bufferSize);
  checkEncryption(text, bufferSize);
  return 0;
}
