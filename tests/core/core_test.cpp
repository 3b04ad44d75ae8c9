#include "tests/core/core_test.h"

#include <json/reader.h>

#include <algorithm>
#include <filesystem>
#include <sstream>

namespace core_tests {
namespace {

using support::LogLine;
using support::SystemLog;
namespace fs = std::filesystem;

constexpr char kPrefix[] = "%s:%d ";
constexpr char kFolder[] = "/var/packages/Corvane/target";
constexpr char kHiddenFolder[] = "/var/packages/Corvane/elsewhere";

Line toLine(const LogLine& line) {
  EXPECT_EQ(line.source(), "oauth_db_basic") << line.text;
  EXPECT_GT(line.number(), 0) << line.text;
  EXPECT_EQ(line.format.rfind(kPrefix, 0), 0U) << line.format;
  return {line.priority, line.format.substr(sizeof(kPrefix) - 1), line.message()};
}

}  // namespace

bool operator==(const Line& a, const Line& b) {
  return a.priority == b.priority && a.format == b.format && a.message == b.message;
}

std::ostream& operator<<(std::ostream& out, const Line& line) {
  return out << '<' << line.priority << "> " << line.message << " (" << line.format << ")";
}

Line plain(const std::string& text) {
  return {kError, text, text};
}

Line runFailed(const std::string& text, int code) {
  return {kError, "Run Command failed!![%s][%d]",
          "Run Command failed!![" + text + "][" + std::to_string(code) + "]"};
}

Json::Value json(std::string text) {
  std::replace(text.begin(), text.end(), '\'', '"');
  std::istringstream stream(text);
  Json::Value value;
  stream >> value;
  return value;
}

void CoreTest::SetUp() {
  World::SetUp();
  Engine::release();
  Creation::release();
  Waiting::release();
  support::Platform::useReadableCipher();
}

void CoreTest::TearDown() {
  if (fs::exists(kHiddenFolder)) showFolder();
  Engine::release();
  Creation::release();
  Waiting::release();
  World::TearDown();
}

std::vector<Line> CoreTest::lines() {
  std::vector<Line> all;
  for (const LogLine& line : SystemLog::lines()) all.push_back(toLine(line));
  return all;
}

std::vector<std::string> CoreTest::messages() {
  std::vector<std::string> all;
  for (const Line& line : lines()) all.push_back(line.message);
  return all;
}

std::vector<Line> CoreTest::tracedLines(int level, const std::function<void()>& operation) {
  SystemLog::clear();
  withDiagnostics(level, operation);
  return lines();
}

std::vector<std::string> CoreTest::traced(int level, const std::function<void()>& operation) {
  std::vector<std::string> all;
  for (const Line& line : tracedLines(level, operation)) {
    EXPECT_EQ(line.priority, kError) << line;
    all.push_back(line.message);
  }
  return all;
}

void CoreTest::blockTable(const std::string& name) {
  sql("CREATE TABLE IF NOT EXISTS other(a); CREATE INDEX " + name + " ON other(a)");
}

std::string CoreTest::blocked(const std::string& name) {
  return "there is already an index named " + name;
}

void CoreTest::hideFolder() {
  fs::rename(kFolder, kHiddenFolder);
}

void CoreTest::showFolder() {
  fs::rename(kHiddenFolder, kFolder);
}

void expectNoError(const KELDOAUTHSERVER::OAUTHDBBasic& store) {
  expectError(store, 255, "");
}

void expectError(const KELDOAUTHSERVER::OAUTHDBBasic& store, int code, const std::string& msg) {
  EXPECT_EQ(store.GetErrCode(), code);
  EXPECT_EQ(store.GetErrMsg(), msg);
}

}  // namespace core_tests
