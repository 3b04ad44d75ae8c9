#include "tests/signing/signing_test.h"

#include <sys/stat.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>

#include "service/signing/strict_json.h"
#include "tests/signing/calls.h"
#include "tests/support/private_mounts.h"

namespace signing_test {

namespace fs = std::filesystem;

void SigningTest::SetUp() {
  support::requirePrivateMounts();
  fs::remove_all(kFolder);
  fs::create_directory(kFolder);
}

void SigningTest::TearDown() {
  Calls::release();
}

const KeySet& SigningTest::anySet() {
  static const KeySet set = KeySet::make(kStart);
  return set;
}

Json::Value SigningTest::vector(const std::string& name) {
  return parsed(readFile(SIGNING_VECTORS "/" + name));
}

std::string SigningTest::readFile(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  EXPECT_TRUE(file) << path;
  return {std::istreambuf_iterator<char>(file), {}};
}

void SigningTest::writeFile(const std::string& path, const std::string& text, unsigned mode) {
  std::ofstream(path, std::ios::binary) << text;
  ASSERT_EQ(::chmod(path.c_str(), mode), 0);
}

unsigned SigningTest::modeOf(const std::string& path) {
  struct stat status {};
  EXPECT_EQ(::lstat(path.c_str(), &status), 0);
  return status.st_mode & 07777U;
}

std::vector<std::string> SigningTest::filesIn(const std::string& folder) {
  std::vector<std::string> names;
  for (const auto& entry : fs::directory_iterator(folder)) {
    names.push_back(entry.path().filename());
  }
  std::sort(names.begin(), names.end());
  return names;
}

void SigningTest::putAnySet() {
  writeFile(kPath, anySet().text());
}

std::string failureOf(const std::function<void()>& body) {
  try {
    body();
    return "";
  } catch (const KeyFault& fault) {
    return fault.what();
  }
}

Json::Value parsed(const std::string& text) {
  return readObject(text).value();
}

std::string written(const Json::Value& value) {
  return compactText(value);
}

}  // namespace signing_test
