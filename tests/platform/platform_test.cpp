#include "tests/platform/platform_test.h"

#include <sys/stat.h>
#include <syslog.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <numeric>

#include "tests/platform/siv.h"
#include "tests/platform/system_calls.h"

namespace {

constexpr char kWatch = '\x5a';

std::string base64Url(const std::string& bytes) {
  const char alphabet[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_";
  std::string text;
  unsigned bits = 0;
  int count = 0;
  for (const char byte : bytes) {
    bits = ((bits & 0x3f) << 8) | static_cast<unsigned char>(byte);
    for (count += 8; count >= 6; count -= 6) text += alphabet[(bits >> (count - 6)) & 63];
  }
  if (count > 0) text += alphabet[(bits << (6 - count)) & 63];
  return text;
}

Text call(const char* name, const std::string& text, std::size_t size) {
  std::vector<char> out(size + 1, kWatch);
  const int result =
      standIn<int(const char*, char*, std::size_t)>(name)(text.c_str(), out.data(), size);
  EXPECT_EQ(out[size], kWatch) << name << " wrote beyond " << size << " bytes";
  if (result == 0) return std::nullopt;
  return std::string(out.data());
}

}  // namespace

void CipherTest::SetUp() {
  World::SetUp();
  SystemCalls::release();
  ::unsetenv("KELDCORE_KEY_FILE");
}

void CipherTest::TearDown() {
  SystemCalls::release();
  ::unsetenv("KELDCORE_KEY_FILE");
  World::TearDown();
}

std::string CipherTest::countingKey() {
  std::string key(64, '\0');
  std::iota(key.begin(), key.end(), '\0');
  return key;
}

void CipherTest::putKey(const std::string& key, const std::string& path, unsigned mode) {
  const std::string draft = path + ".new";
  writeFile(draft, key);
  ASSERT_EQ(::chmod(draft.c_str(), static_cast<mode_t>(mode)), 0);
  ASSERT_EQ(std::rename(draft.c_str(), path.c_str()), 0);
}

void CipherTest::useKeyFile(const std::string& path) {
  ASSERT_EQ(::setenv("KELDCORE_KEY_FILE", path.c_str(), 1), 0);
}

unsigned CipherTest::modeOf(const std::string& path) {
  struct stat status {};
  EXPECT_EQ(::stat(path.c_str(), &status), 0) << path;
  return static_cast<unsigned>(status.st_mode) & 07777;
}

std::vector<std::string> CipherTest::filesIn(const std::string& folder) {
  std::vector<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(folder)) {
    names.push_back(entry.path().filename());
  }
  std::sort(names.begin(), names.end());
  return names;
}

void CipherTest::expectOneLine(const std::string& path, const std::string& reason) {
  const std::vector<support::LogLine> lines = support::SystemLog::lines();
  support::SystemLog::clear();
  ASSERT_EQ(lines.size(), 1U);
  EXPECT_EQ(lines.front().text, "keldcore: key file " + path + ": " + reason);
  EXPECT_EQ(lines.front().priority, LOG_ERR);
}

Text CipherTest::encrypt(const std::string& text, std::size_t size) {
  return call("KCORECryptSzEncrypt", text, size);
}

Text CipherTest::decrypt(const std::string& cipher, std::size_t size) {
  return call("KCORECryptSzDecrypt", cipher, size);
}

std::string CipherTest::seal(const std::string& key, const std::string& label,
                             const std::string& text) {
  if (key.size() != 64) {
    ADD_FAILURE() << "a key of " << key.size() << " bytes";
    return "";
  }
  return base64Url(siv::seal(key, {"", label}, text));
}
