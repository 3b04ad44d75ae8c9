// The numbers of the log lines: their tables in the sources, the page for
// readers, and that each leads to one place in the code.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <ostream>
#include <regex>
#include <set>
#include <string>
#include <vector>

namespace fs = std::filesystem;
using ::testing::IsEmpty;

namespace {

std::string contentOf(const fs::path& path) {
  std::ifstream file(path);
  EXPECT_TRUE(file) << path;
  return {std::istreambuf_iterator<char>(file), {}};
}

std::vector<std::smatch> matches(const std::string& text, const std::regex& pattern) {
  return {std::sregex_iterator(text.begin(), text.end(), pattern), {}};
}

bool endsWith(const std::string& text, const std::string& end) {
  return text.size() >= end.size() && text.compare(text.size() - end.size(), end.size(), end) == 0;
}

/// The sources that log, by path.
std::map<std::string, std::string> sources() {
  std::map<std::string, std::string> all;
  for (const char* folder : {"core", "stores", "utils"}) {
    for (const auto& entry : fs::directory_iterator(folder)) {
      all[entry.path().string()] = contentOf(entry.path());
    }
  }
  return all;
}

/// One number of a source's table.
struct Constant {
  std::string name;
  int number;
};

/// A source name, and the file with its table.
struct Source {
  const char* name;
  const char* table;
};
void PrintTo(const Source& source, std::ostream* out) {
  *out << source.name;
}

const Source kSources[] = {
    {"oauth_db_basic", "core/log_lines.h"},
    {"oauth_utils", "utils/oauth_utils.cpp"},
    {"oauth_clientInfo", "stores/oauth_clientInfo.cpp"},
    {"oauth_grantCode", "stores/oauth_grantCode.cpp"},
    {"oauth_token", "stores/oauth_token.cpp"},
    {"oauth_log", "stores/oauth_log.cpp"},
};

/// A row of the page.
struct Documented {
  int number;
  std::string message;
  std::string file;
};

class LogLinesTest : public ::testing::TestWithParam<Source> {
 protected:
  static std::vector<Constant> constants() {
    const std::string text = contentOf(GetParam().table);
    const std::string table = text.substr(text.find("Line : int {"));
    const std::string body = table.substr(0, table.find("};"));
    std::vector<Constant> all;
    for (const auto& match : matches(body, std::regex("(k\\w+) = ([0-9]+),"))) {
      all.push_back({match[1].str(), std::stoi(match[2].str())});
    }
    return all;
  }

  /// Behind its heading stands the file, unless each row has one.
  static std::vector<Documented> documented() {
    const std::string page = contentOf("docs/diagnostics.md");
    const std::string heading = std::string("\n## ") + GetParam().name + "\n";
    const std::size_t start = page.find(heading);
    EXPECT_NE(start, std::string::npos) << heading;
    const std::string section = page.substr(start, page.find("\n## ", start + 1) - start);

    std::smatch in;
    std::regex_search(section, in, std::regex("In `([^`]+)`"));
    const std::string common = in.empty() ? "" : in[1].str();
    const std::regex row("\n\\| ([0-9]+) \\| `([^\n]*?)` \\|[^\n|]*\\|[^\n|]*\\|( `([^`]+)` \\|)?");
    std::vector<Documented> all;
    for (const auto& match : matches(section, row)) {
      const std::string file = match[4].matched ? match[4].str() : common;
      all.push_back({std::stoi(match[1].str()), match[2].str(), file});
    }
    return all;
  }

  /// The one place that uses a constant; empty when there is none or another.
  static std::string userOf(const Constant& constant) {
    const bool isCore = GetParam().name == std::string("oauth_db_basic");
    const std::regex use((isCore ? "line::" : "\\b") + constant.name + "\\b(?! = )");
    std::vector<std::string> users;
    for (const auto& [path, text] : sources()) {
      const bool isItsOwn = isCore ? path != GetParam().table : path == GetParam().table;
      if (!isItsOwn) continue;
      users.insert(users.end(), matches(text, use).size(), path);
    }
    return users.size() == 1 ? users.front() : "";
  }

  /// A message is a literal behind source and number, in the file that has the
  /// number or, for a table of numbers, in the core's chief source.
  static bool stands(const Documented& line) {
    const std::string literal = "\"%s:%d " + line.message + "\"";
    return contentOf(line.file).find(literal) != std::string::npos ||
           (line.file == "core/schema.h" &&
            contentOf("core/oauth_db_basic.cpp").find(literal) != std::string::npos);
  }
};

TEST_P(LogLinesTest, StandForOneMessageEach) {
  std::set<int> numbers;
  for (const Constant& constant : constants()) {
    EXPECT_TRUE(numbers.insert(constant.number).second) << constant.name;
  }
  EXPECT_GE(numbers.size(), 2U);
}

TEST_P(LogLinesTest, AreUsedInOnePlaceEach) {
  for (const Constant& constant : constants()) EXPECT_NE(userOf(constant), "") << constant.name;
}

TEST_P(LogLinesTest, AreTheOnesOnThePage) {
  std::vector<int> known;
  for (const Constant& constant : constants()) known.push_back(constant.number);
  std::vector<int> rows;
  for (const Documented& line : documented()) rows.push_back(line.number);
  EXPECT_EQ(rows, known);
}

TEST_P(LogLinesTest, StandInTheFileThatThePageNames) {
  const auto known = constants();
  const auto rows = documented();
  ASSERT_EQ(rows.size(), known.size());
  for (std::size_t i = 0; i < rows.size(); ++i) {
    EXPECT_EQ(rows[i].file, userOf(known[i])) << known[i].name;
  }
}

TEST_P(LogLinesTest, HaveTheMessagesOnThePage) {
  const auto known = constants();
  const auto rows = documented();
  ASSERT_EQ(rows.size(), known.size());
  for (std::size_t i = 0; i < rows.size(); ++i) {
    const std::string& name = known[i].name;
    if (endsWith(name, "Threw")) {
      EXPECT_EQ(rows[i].message, "Unexpected failure[%s]") << name;
    } else if (rows[i].message == "==> %s") {
      const std::regex trace("traceEntry\\([^;]*\\b" + name + "\\b");
      EXPECT_TRUE(std::regex_search(contentOf(rows[i].file), trace)) << name;
    } else {
      EXPECT_TRUE(stands(rows[i])) << name << ": " << rows[i].message;
    }
    const bool isEntry = endsWith(name, "Entry");
    EXPECT_EQ(isEntry, isEntry && rows[i].message.rfind("==> ", 0) == 0) << name;
  }
}

INSTANTIATE_TEST_SUITE_P(Of, LogLinesTest, ::testing::ValuesIn(kSources),
                         ::testing::PrintToStringParamName());

/// A line's own number would move with every line above it.
TEST(LogNumbersTest, AreNeverThatOfTheLine) {
  std::vector<std::string> found;
  for (const auto& [path, text] : sources()) {
    if (text.find("__LINE__") != std::string::npos) found.push_back(path);
  }
  EXPECT_THAT(found, IsEmpty());
}

TEST(LogNumbersTest, OfEverySourceAreInATable) {
  std::set<std::string> named;
  for (const auto& [path, text] : sources()) {
    for (const auto& match : matches(text, std::regex("kSource\\[\\] = \"(\\w+)\""))) {
      named.insert(match[1].str());
    }
  }
  std::set<std::string> known;
  for (const Source& source : kSources) known.insert(source.name);
  EXPECT_EQ(named, known);
}

}  // namespace
