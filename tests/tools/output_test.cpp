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
        Shown{"Backslash", "AD\\alice", "AD\\alice"}, Shown{"Quotes", "\"O'Neil\"", "\"O''Neil\""},
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
  addClient("日本語日本語日本語");
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
  const std::string identifier = addClient(std::string(64, 'n'))["client_id"].asString();
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

TEST_F(Output, ShortAndStrangeSecretsAreMaskedWhole) {
  addClient();
  issueCode();
  for (const std::string code : {"abcdefg", "\x1b[31maaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaa", ""}) {
    sql("UPDATE oauth_grantCode SET code='" + code + "'");
    EXPECT_EQ(json({"code", "show", "1"})["code"]["code"], kMask);
  }
}

}  // namespace
}  // namespace cli
