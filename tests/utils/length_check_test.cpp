#include <limits>

#include "tests/support/case_name.h"
#include "tests/support/world.h"
#include "utils/oauth_utils.h"

namespace {

using namespace KELDOAUTHSERVER;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

struct Check {
  const char* name;
  std::string text;
  int min;
  int max;
  bool passes;
  bool passesAllowingEmpty;
};

void PrintTo(const Check& check, std::ostream* out) {
  *out << "\"" << check.text << "\" in " << check.min << " to " << check.max;
}

class LengthCheckTest : public ::testing::TestWithParam<Check> {};

TEST_P(LengthCheckTest, WithoutEmptyAllowed) {
  const Check& check = GetParam();
  EXPECT_EQ(checkStrLen(check.text, check.min, check.max, false), check.passes);
  EXPECT_EQ(checkStrLen(check.text, check.min, check.max), check.passes);
}

TEST_P(LengthCheckTest, WithEmptyAllowed) {
  const Check& check = GetParam();
  EXPECT_EQ(checkStrLen(check.text, check.min, check.max, true), check.passesAllowingEmpty);
}

constexpr int kLowest = std::numeric_limits<int>::min();
constexpr int kHighest = std::numeric_limits<int>::max();

const Check kChecks[] = {
    {"EmptyBelowMin", "", 1, 64, false, true},
    {"EmptyAtMin", "", 0, 64, true, true},
    {"EmptyAboveMax", "", -5, -1, false, true},
    {"EmptyWithReversedBounds", "", 64, 1, false, true},
    {"BelowMin", "ab", 3, 5, false, false},
    {"AtMin", "abc", 3, 5, true, true},
    {"Between", "abcd", 3, 5, true, true},
    {"AtMax", "abcde", 3, 5, true, true},
    {"AboveMax", "abcdef", 3, 5, false, false},
    {"ExactLength", std::string(64, 'a'), 64, 64, true, true},
    {"OneShortOfExact", std::string(63, 'a'), 64, 64, false, false},
    {"OneBeyondExact", std::string(65, 'a'), 64, 64, false, false},
    {"ReversedBounds", "abcd", 5, 3, false, false},
    {"BoundsAreSigned", "a", -1, 1, true, true},
    {"NegativeMax", "a", kLowest, -1, false, false},
    {"WidestBounds", "a", kLowest, kHighest, true, true},
    {"TwoByteCharacterFits", "\xc3\xa4", 2, 2, true, true},
    {"TwoByteCharacterIsTwo", "\xc3\xa4", 1, 1, false, false},
    {"FourByteCharacterIsFour", "\xf0\x9f\x94\x91", 1, 3, false, false},
    {"InvalidUtf8CountsByBytes", "\xff\xfe\x80", 3, 3, true, true},
    {"NulByteCounts", std::string("a\0b", 3), 3, 3, true, true},
    {"NulByteAloneIsNotEmpty", std::string(1, '\0'), 2, 9, false, false},
    {"BlanksCount", "   ", 3, 3, true, true},
    {"Megabyte", std::string(1 << 20, 'x'), 1, 1 << 20, true, true},
    {"MegabyteAndOne", std::string((1 << 20) + 1, 'x'), 1, 1 << 20, false, false},
};

INSTANTIATE_TEST_SUITE_P(Utilities, LengthCheckTest, ::testing::ValuesIn(kChecks),
                         support::CaseName());

class LengthCheckTraceTest : public support::World {};

TEST_F(LengthCheckTraceTest, CarriesTheCheckedTextInClear) {
  withDiagnostics(4, [] { checkStrLen("s3cret", 1, 64, true); });
  const std::vector<support::LogLine> lines = SystemLog::lines();
  ASSERT_EQ(lines.size(), 1U);
  EXPECT_EQ(lines[0].priority, 3);
  EXPECT_EQ(lines[0].source(), "oauth_utils");
  EXPECT_GT(lines[0].number(), 0);
  EXPECT_EQ(lines[0].format, "%s:%d %s[%s]");
  EXPECT_EQ(lines[0].message(), "checkStrLen[s3cret]");
}

TEST_F(LengthCheckTraceTest, IsWrittenWhateverTheResult) {
  withDiagnostics(4, [] {
    checkStrLen("", 1, 2, true);
    checkStrLen("", 1, 2, false);
    checkStrLen("abc", 1, 2);
  });
  EXPECT_THAT(SystemLog::messages(),
              ElementsAre("checkStrLen[]", "checkStrLen[]", "checkStrLen[abc]"));
}

TEST_F(LengthCheckTraceTest, IsSilentAtEveryOtherLevel) {
  withDiagnostics(1 + 2 + 8 + 16, [] { checkStrLen("s3cret", 1, 64); });
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(LengthCheckTraceTest, TextIsNoFormat) {
  withDiagnostics(4, [] { checkStrLen("%s%d%n", 1, 64); });
  EXPECT_THAT(SystemLog::messages(), ElementsAre("checkStrLen[%s%d%n]"));
}

TEST_F(LengthCheckTraceTest, LongTextIsNotCut) {
  const std::string text(1 << 20, 'x');
  withDiagnostics(4, [&] { checkStrLen(text, 1, 64); });
  EXPECT_THAT(SystemLog::messages(), ElementsAre("checkStrLen[" + text + "]"));
}

}  // namespace
