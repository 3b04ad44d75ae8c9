// Texts that try to be more than texts, in every argument of every operation.

#include <gmock/gmock.h>
#include <json/value.h>

#include <string>

#include "tests/stores/text_operations.h"

using support::Row;
using ::testing::IsEmpty;

namespace {

/// None longer than the shortest upper bound, 32 bytes.
const std::vector<std::string>& hostileTexts() {
  static const std::vector<std::string> texts{
      "'",
      "''''",
      "it's 'quoted'",
      "' OR '1'='1",
      "'); DROP TABLE oauth_token; --",
      "', enable='0' WHERE id='2'; --",
      "\"double\" `back` [brackets]",
      "%s%n%d %q %100x",
      "100%_*?",
      "back\\slash \\'",
      "line\nfeed\r\ttab\x01\x7f",
      "-- /* comment */ ; ;",
      "\xff\xfe\xc0\x80 no UTF-8",
      "cut off \xe6\xbc",
      "\xef\xbb\xbf\xe6\xbc\xa2\xe5\xad\x97 \xf0\x9f\x94\x91",
      "NULL",
      "0x41",
      "\xe2\x80\x99 no quote",
  };
  return texts;
}

std::string doubled(const std::string& text) {
  std::string result;
  for (const char c : text) result.append(c == '\'' ? 2 : 1, c);
  return result;
}

/// Long enough for the argument, and as short as it can be.
std::string fitted(std::string text, const Argument& argument) {
  text.resize(std::max(text.size(), argument.min), 'x');
  return text;
}

class HostileTextTest : public OperationsTest,
                        public ::testing::WithParamInterface<OperationArgument> {
 protected:
  static const Operation& operation() { return GetParam().operation; }
  static const Argument& argument() { return GetParam().argument; }

  static Aftermath runWith(const std::string& text) {
    Json::Value out;
    const Aftermath outcome = operation().run({{argument().name, text}}, out);
    // A registration's entry has tests of its own.
    sql("DELETE FROM oauth_log WHERE id > 2;");
    return outcome;
  }

  static std::string storedText() {
    return sqlText("SELECT " + argument().name + " FROM " + operation().table +
                   " WHERE id=" + operation().row + ";");
  }

  static std::string expectedText(const std::string& text) {
    const std::string clear = argument().stored == Stored::kAsGiven ? text : doubled(text);
    const bool isSecret = argument().name == "client_id" || argument().name == "client_secret";
    return isSecret ? cipher(clear) : clear;
  }

  /// The row that is written may change, nothing else.
  static std::vector<Row> others() { return everythingBut(operation().table, operation().row); }
};

TEST_P(HostileTextTest, StaysAText) {
  for (const std::string& hostile : hostileTexts()) {
    SCOPED_TRACE(hostile);
    startAfresh();
    const std::vector<Row> before = others();
    const std::string text = fitted(hostile, argument());
    const Aftermath outcome = runWith(text);
    EXPECT_THAT(outcome.lines, IsEmpty());
    EXPECT_EQ(outcome.code, kCodeBefore);
    EXPECT_EQ(others(), before);
    if (!operation().row.empty()) {
      EXPECT_EQ(storedText(), expectedText(text));
    }
  }
}

/// A doubled text ends at the first NUL byte. One that is handed on as given
/// takes the NUL into the statement, which ends there and is refused; as an
/// identifier it goes through the cipher first, which ends it, too.
TEST_P(HostileTextTest, EndsAtNul) {
  std::string text = fitted("cut 'here", argument());
  text[text.size() - 1] = '\0';
  const std::string head = text.substr(0, text.size() - 1);
  const std::vector<Row> before = others();
  const Aftermath outcome = runWith(text);
  EXPECT_EQ(others(), before);

  if (argument().stored == Stored::kAsGiven && argument().name != "client_id") {
    EXPECT_FALSE(outcome.ok);
    EXPECT_EQ(outcome.code, 1);
    EXPECT_THAT(outcome.message, ::testing::StartsWith("unrecognized token: \"'cut ''her"));
  } else if (!operation().row.empty()) {
    EXPECT_TRUE(succeeded(outcome));
    EXPECT_EQ(storedText(), expectedText(head));
  }
}

INSTANTIATE_TEST_SUITE_P(Stores, HostileTextTest, ::testing::ValuesIn(operationArguments()),
                         ::testing::PrintToStringParamName());

}  // namespace
