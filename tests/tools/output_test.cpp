// What values look like that somebody else chose: on a terminal, in a pipe and
// in JSON.

#include <algorithm>
#include <cstdlib>
#include <filesystem>

#include "tests/tools/cli.h"

namespace cli {
namespace {

using testing::Each;
using testing::HasSubstr;
using testing::Le;
using testing::Not;

class Output : public CliTest {
 protected:
  static std::string nameInTable(const std::string& name) {
    addClient(name);
    const std::string line = lines(run({"client", "list"}).out).at(1);
    const std::size_t start = line.find("yes") + 9;
    return line.substr(start, line.find("  ", start) - start);
  }

  /// Characters of Chinese and Japanese take two.
  static std::size_t columnsOf(const std::string& line) {
    std::size_t columns = 0;
    for (const char c : line) {
      const auto byte = static_cast<unsigned char>(c);
      if ((byte & 0xC0U) != 0x80U) columns += byte >= 0xE3U ? 2 : 1;
    }
    return columns;
  }

  static bool isPlainAscii(const std::string& text) {
    return std::all_of(text.begin(), text.end(),
                       [](signed char c) { return c >= ' ' && c != '\x7f'; });
  }
};

struct Shown {
  const char* what;
  std::string name;
  std::string shown;
};

class HostileName : public Output, public testing::WithParamInterface<Shown> {};

TEST_P(HostileName, InATable) {
  EXPECT_EQ(nameInTable(GetParam().name), GetParam().shown);
}

TEST_P(HostileName, InDetails) {
  addClient(GetParam().name);
  EXPECT_THAT(run({"client", "show", "1"}).out,
              HasSubstr("\nname           " + GetParam().shown + "\n"));
}

TEST_P(HostileName, InASentence) {
  addClient(GetParam().name);
  EXPECT_EQ(run({"client", "disable", "1"}).out, "Disabled client 1 (" + GetParam().shown + ").\n");
}

TEST_P(HostileName, InJson) {
  addClient(GetParam().name);
  EXPECT_TRUE(isPlainAscii(lines(run({"client", "list", "--json"}).out).at(0)));
}

INSTANTIATE_TEST_SUITE_P(
    Names, HostileName,
    testing::Values(
        Shown{"Escape", "\x1b[31mred\x1b]0;x\x07", "\\x1b[31mred\\x1b]0;x\\x07"},
        Shown{"LineEnds", "a\nb\r\tc", "a\\nb\\r\\tc"}, Shown{"Delete", "a\x7f", "a\\x7f"},
        Shown{"C1Control",
              "a\xc2\x9b"
              "31m",
              "a\\u{9b}31m"},
        Shown{"NoUtf8", "a\xff\xfe", "a\\xff\\xfe"}, Shown{"Truncated", "a\xe2\x82", "a\\xe2\\x82"},
        Shown{"Overlong", "\xc0\xaf", "\\xc0\\xaf"},
        Shown{"Surrogate", "\xed\xa0\x80", "\\xed\\xa0\\x80"},
        Shown{"TurnsTheText", "abc\u202Efed", "abc\\u{202e}fed"},
        Shown{"Invisible", "ad\u200Bmin", "ad\\u{200b}min"},
        Shown{"LineSeparator", "a\u2028b", "a\\u{2028}b"},
        Shown{"Backslash", "AD\\alice", "AD\\alice"}, Shown{"Quotes", "\"O'Neil\"", "\"O'Neil\""},
        Shown{"Wide", "日本語", "日本語"}, Shown{"Combining", "e\u0301t\u00e9", "e\u0301t\u00e9"},
        Shown{"Emoji", "👨\u200D👩", "👨\u200D👩"}),
    [](const auto& test) { return test.param.what; });

TEST_F(Output, AKeyFilesNameInAWarning) {
  addClient();
  std::filesystem::remove("/tmp/copy.db");
  run({"backup", "/tmp/copy.db"});
  ::setenv("KELDCORE_KEY_FILE", "/tmp/\x1b\x7f\xc2\x9b/key", 1);
  const Outcome outcome = run({"restore", "/tmp/copy.db", "--yes"});
  ::unsetenv("KELDCORE_KEY_FILE");
  EXPECT_THAT(outcome, ExitsWith(kUnhealthy));
  EXPECT_THAT(outcome.err, HasSubstr("the key file /tmp/\\x1b\\x7f\\u{9b}/key is missing"));
}

// JSON ----------------------------------------------------------------------------

TEST_F(Output, JsonKeepsControlCharacters) {
  addClient("a\x1b\n\"\\");
  EXPECT_EQ(json({"client", "list"})["clients"][0]["display_name"], "a\x1b\n\"\\");
}

TEST_F(Output, JsonKeepsDelete) {
  addClient("a\x7f\xc2\x85");
  EXPECT_EQ(json({"client", "list"})["clients"][0]["display_name"], "a\x7f\xc2\x85");
}

TEST_F(Output, JsonOfAMistakeHasNoControlCharacter) {
  const Outcome outcome = run({"client", "show", "a\x7f\xc2\x9b\x1b", "--json"});
  EXPECT_TRUE(isPlainAscii(lines(outcome.out).at(0))) << outcome.out;
}

TEST_F(Output, JsonKeepsUtf8) {
  addClient("日本語 👨");
  EXPECT_EQ(json({"client", "list"})["clients"][0]["display_name"], "日本語 👨");
}

TEST_F(Output, JsonReplacesWhatIsNoUtf8) {
  addClient(
      "a\xff"
      "b");
  EXPECT_EQ(json({"client", "list"})["clients"][0]["display_name"], "a\uFFFDb");
}

TEST_F(Output, JsonHasNumbersWhereTheyAreNumbers) {
  addClient();
  issueCode();
  const Json::Value code = json({"code", "show", "1"})["code"];
  EXPECT_TRUE(code["id"].isInt());
  EXPECT_TRUE(code["expired_time"].isInt64());
  EXPECT_TRUE(code["expired"].isBool());
  EXPECT_TRUE(code["state"].isString());
}

TEST_F(Output, RowIdsOf64Bits) {
  addClient();
  sql("UPDATE oauth_clientInfo SET id=9223372036854775807");
  EXPECT_EQ(json({"client", "show", "9223372036854775807"})["client"]["id"],
            Json::Value(Json::Int64{9223372036854775807}));
}

// Tables --------------------------------------------------------------------------

TEST_F(Output, TablesFitTheTerminal) {
  addClient("日本語日本語日本語日本語日本語日本語");
  issueToken();
  for (const char* group : {"client", "token"}) {
    const Outcome shown = runOnTerminal({group, "list"}, {}, 80);
    std::vector<std::size_t> widths;
    for (const std::string& line : lines(shown.out)) {
      widths.push_back(static_cast<std::size_t>(
          std::count_if(line.begin(), line.end(), [](char c) { return (c & 0xC0) != 0x80; })));
    }
    ASSERT_EQ(widths.size(), 2U);
    EXPECT_THAT(widths, Each(Le(80U)));
    EXPECT_THAT(shown.out, HasSubstr(kMask));
  }
}

/// The widths of the lines that a terminal of 40 columns shows.
TEST_F(Output, TablesFitFortyColumns) {
  addClient("日本語日本語日本語 and a long name in Latin");
  issueCode();
  issueToken({"--ip", "2001:db8:1111:2222:3333:4444:5555:6666"});
  for (const Arguments& command :
       {Arguments{"client", "list"}, Arguments{"code", "list"}, Arguments{"token", "list"},
        Arguments{"user", "list"}, Arguments{"user", "show", "alice"}, Arguments{"log", "list"},
        Arguments{"code", "purge", "--dry-run"}}) {
    SCOPED_TRACE(testing::PrintToString(command));
    const Outcome shown = runOnTerminal(command, {}, 40);
    EXPECT_THAT(shown, ExitsWith(kOk));
    for (const std::string& line : lines(shown.out)) EXPECT_LE(columnsOf(line), 40U) << line;
  }
}

TEST_F(Output, ATableWithoutRoomIsARecordForEachRow) {
  addClient();
  issueToken();
  issueToken();
  ::setenv("COLUMNS", "40", 1);
  const std::vector<std::string> shown = lines(run({"token", "list"}).out);
  ::unsetenv("COLUMNS");
  ASSERT_EQ(shown.size(), 15U);
  EXPECT_EQ(shown[0], "ID        1");
  EXPECT_EQ(shown[1], "USERNAME  alice");
  EXPECT_EQ(shown[2], "CLIENT    Photo Frame");
  EXPECT_EQ(shown[7], "");
  EXPECT_EQ(shown[8], "ID        2");
}

TEST_F(Output, WideCharactersCountTwice) {
  ::setenv("COLUMNS", "51", 1);
  addClient("日本語日本語日本語日本語日本語");
  addClient("abcdefghijklmnopqrstuvwxyz");
  const std::vector<std::string> shown = lines(run({"client", "list"}).out);
  // Eight columns: a half of a wide character does not fit into the last one.
  EXPECT_THAT(shown[1], testing::ContainsRegex("yes      日本語…   [0-9a-f]"));
  EXPECT_THAT(shown[2], testing::ContainsRegex("yes      abcdefg…  [0-9a-f]"));
  ::unsetenv("COLUMNS");
}

TEST_F(Output, NothingIsCutInAPipe) {
  const std::string identifier = addClient(std::string(63, 'n'))["client_id"].asString();
  EXPECT_THAT(run({"client", "list"}).out, HasSubstr(identifier));
}

TEST_F(Output, ColumnsOverridesTheWidth) {
  const std::string identifier = addClient()["client_id"].asString();
  ::setenv("COLUMNS", "70", 1);
  EXPECT_THAT(run({"client", "list"}).out, Not(HasSubstr(identifier)));
  ::setenv("COLUMNS", "nonsense", 1);
  EXPECT_THAT(run({"client", "list"}).out, HasSubstr(identifier));
  ::unsetenv("COLUMNS");
}

TEST_F(Output, NoLineEndsInBlanks) {
  addClient();
  issueCode();
  for (const Arguments& command : {Arguments{"client", "list"}, Arguments{"code", "list"},
                                   Arguments{"code", "show", "1"}, Arguments{"status"}}) {
    EXPECT_THAT(lines(run(command).out), Each(Not(testing::EndsWith(" "))));
  }
}

// Masking -------------------------------------------------------------------------

TEST_F(Output, SecretsAreMaskedWhoeverMadeThem) {
  const Outcome added = run(
      {"client", "add", "--no-redirect-uri", "--scope", "x", "--name", "y", "--secret-file", "-"},
      support::id64('s'));
  ASSERT_THAT(added, ExitsWith(kOk));
  EXPECT_EQ(json({"client", "show", "1"})["client"]["client_secret"],
            std::string("ssssss") + kMask);
  const std::string other(addClient()["client_secret"].asString());
  EXPECT_EQ(json({"client", "show", "2"})["client"]["client_secret"], other.substr(0, 6) + kMask);
}

}  // namespace
}  // namespace cli
