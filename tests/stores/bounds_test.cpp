// Every text of every operation at its bounds, and the order of the checks.

#include <gmock/gmock.h>
#include <json/value.h>

#include <regex>
#include <string>

#include "tests/stores/text_operations.h"

using support::Row;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

namespace {

/// `characters` characters of two bytes each, and a last byte where it is odd.
std::string twoByteText(std::size_t bytes) {
  std::string text;
  while (text.size() + 2 <= bytes) text += "\xc3\xa9";
  return text.append(bytes - text.size(), 'x');
}

class BoundsTest : public OperationsTest, public ::testing::WithParamInterface<OperationArgument> {
 protected:
  static const Operation& operation() { return GetParam().operation; }
  static const Argument& argument() { return GetParam().argument; }

  static void expectAccepted(const std::string& text) {
    startAfresh();
    Json::Value out;
    const Aftermath outcome = operation().run({{argument().name, text}}, out);
    EXPECT_THAT(outcome.lines, IsEmpty()) << text.size();
    EXPECT_EQ(outcome.code, kCodeBefore) << text.size();
    if (!operation().row.empty()) {
      EXPECT_EQ(storedText(), text);
    }
  }

  static void expectRefused(const std::string& text) {
    startAfresh();
    const std::vector<Row> before = everything();
    Json::Value out;
    const Aftermath outcome = operation().run({{argument().name, text}}, out);
    EXPECT_TRUE(failed(outcome, operation().refusalCode, operation().refusalMessage()))
        << text.size();
    EXPECT_THAT(outcome.lines, ElementsAre(operation().refusal)) << text.size();
    EXPECT_TRUE(out.isNull()) << out.toStyledString();
    EXPECT_EQ(everything(), before);
  }

  /// What the file holds of the argument, in the clear.
  static std::string storedText() {
    const std::string stored = sqlText("SELECT " + argument().name + " FROM " + operation().table +
                                       " WHERE id=" + operation().row + ";");
    const bool isSecret = argument().name == "client_id" || argument().name == "client_secret";
    return isSecret ? stored.substr(1, stored.size() - 2) : stored;
  }
};

TEST_P(BoundsTest, AreBothIncluded) {
  expectRefused(textOf(argument().min - 1));
  expectAccepted(textOf(argument().min));
  expectAccepted(textOf(argument().max));
  expectRefused(textOf(argument().max + 1));
}

TEST_P(BoundsTest, CountBytes) {
  expectAccepted(twoByteText(argument().max));
  expectRefused(twoByteText(argument().max * 2));
  expectRefused(twoByteText(argument().max + 1));
}

TEST_P(BoundsTest, RefuseNothingAndAMegabyte) {
  expectRefused("");
  expectRefused(textOf(1 << 20));
}

INSTANTIATE_TEST_SUITE_P(Stores, BoundsTest, ::testing::ValuesIn(operationArguments()),
                         ::testing::PrintToStringParamName());

// Order -----------------------------------------------------------------------

/// At log level 4 the length check says what it is asked.
class CheckOrderTest : public OperationsTest, public ::testing::WithParamInterface<Operation> {
 protected:
  /// The arguments that were checked, in order, when the one named is empty.
  static Lines checked(const std::string& empty) {
    Texts texts;
    for (const Argument& argument : GetParam().arguments) {
      if (argument.stored == Stored::kGenerated) continue;
      texts[argument.name] = argument.name == empty ? "" : textFor(argument);
    }
    Lines found;
    withDiagnostics(4, [&] {
      Json::Value out;
      GetParam().run(texts, out);
      for (const std::string& line : journalOf("oauth_utils")) found.push_back(withoutDigits(line));
    });
    return found;
  }

  static std::string check(const std::string& text) {
    return "oauth_utils checkStrLen[" + text + "]";
  }

  /// The check of a good text.
  static std::string check(const Argument& argument) {
    const bool isGenerated = argument.stored == Stored::kGenerated;
    return check(isGenerated ? "<generated>" : textFor(argument));
  }

 private:
  /// A text of the right length that tells the argument.
  static std::string textFor(const Argument& argument) {
    std::string text = argument.name;
    return text.append(argument.min > text.size() ? argument.min - text.size() : 0, '.');
  }

  static std::string withoutDigits(const std::string& line) {
    static const std::regex generated("\\[([0-9a-f]{64}|[0-9]{10})\\]");
    return std::regex_replace(line, generated, "[<generated>]");
  }
};

TEST_P(CheckOrderTest, EveryArgumentIsCheckedOnceInOrder) {
  Lines expected;
  for (const Argument& argument : GetParam().arguments) expected.push_back(check(argument));
  EXPECT_EQ(checked("none"), expected);
}

TEST_P(CheckOrderTest, ChecksStopAtTheFirstBadArgument) {
  Lines expected;
  for (const Argument& argument : GetParam().arguments) {
    if (argument.stored != Stored::kGenerated) {
      expected.push_back(check(""));
      EXPECT_EQ(checked(argument.name), expected) << argument.name;
      expected.pop_back();
    }
    expected.push_back(check(argument));
  }
}

INSTANTIATE_TEST_SUITE_P(Stores, CheckOrderTest, ::testing::ValuesIn(operations()),
                         ::testing::PrintToStringParamName());

using ClientCheckOrderTest = OperationsTest;

TEST_F(ClientCheckOrderTest, SwitchIsLookedAtAfterTheLengths) {
  Lines lines;
  withDiagnostics(4, [&] {
    addClient({{"enable", "maybe"}});
    lines = journal();
  });
  ASSERT_EQ(lines.size(), 6U);
  EXPECT_EQ(lines[4], "oauth_utils checkStrLen[App]");
  EXPECT_EQ(lines[5], "oauth_clientInfo:76 Bad parameters");
}

TEST_F(ClientCheckOrderTest, AddressIsCheckedWithoutItsScheme) {
  Lines lines;
  withDiagnostics(4, [&] {
    addClient({{"redirect_uri", "https://ab"}});
    lines = journal();
  });
  ASSERT_EQ(lines.size(), 4U);
  EXPECT_EQ(lines[2], "oauth_utils checkStrLen[ab]");
}

}  // namespace
