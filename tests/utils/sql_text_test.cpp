#include <sqlite3.h>

#include "tests/support/allocations.h"
#include "tests/support/case_name.h"
#include "tests/support/world.h"
#include "utils/oauth_utils.h"

namespace {

using namespace KELDOAUTHSERVER;
using support::SystemLog;
using ::testing::IsEmpty;

// Quoting ---------------------------------------------------------------------

struct Quoting {
  const char* name;
  std::string value;
  std::string quoted;
};

void PrintTo(const Quoting& quoting, std::ostream* out) {
  *out << quoting.value.substr(0, 80);
}

class QuotingTest : public ::testing::TestWithParam<Quoting> {};

TEST_P(QuotingTest, DoublesSingleQuotesAndNothingElse) {
  EXPECT_EQ(getSQLFormatStr(GetParam().value), GetParam().quoted);
}

TEST_P(QuotingTest, IsTheSameWithinALikePredicate) {
  EXPECT_EQ(getSQLFormatLikeStr("msg", GetParam().value), "msg like '%" + GetParam().quoted + "%'");
}

const Quoting kQuotings[] = {
    {"Empty", "", ""},
    {"Plain", "plain text", "plain text"},
    {"QuoteInside", "it's", "it''s"},
    {"QuoteAlone", "'", "''"},
    {"QuotesAtBothEnds", "'a'", "''a''"},
    {"QuotesInARow", "a'''b", "a''''''b"},
    {"AlreadyDoubled", "it''s", "it''''s"},
    {"DoubleQuote", "say \"hi\"", "say \"hi\""},
    {"Backslash", "a\\'b\\", "a\\''b\\"},
    {"Percent", "50%", "50%"},
    {"FormatDirectives", "%s%q%n%d%%", "%s%q%n%d%%"},
    {"Underscore", "a_b", "a_b"},
    {"Lines", "a\nb\r\nc\td", "a\nb\r\nc\td"},
    {"ControlBytes", "\x01\x1f\x7f", "\x01\x1f\x7f"},
    {"Statement", "x'; DROP TABLE oauth_token;--", "x''; DROP TABLE oauth_token;--"},
    {"Utf8", "d\xc3\xa9j\xc3\xa0 'vu' \xf0\x9f\x94\x91",
     "d\xc3\xa9j\xc3\xa0 ''vu'' \xf0\x9f\x94\x91"},
    {"InvalidUtf8", "\xff'\xfe\x80\xc3", "\xff''\xfe\x80\xc3"},
    {"TypographicQuotes", "\xe2\x80\x99\xca\xbc", "\xe2\x80\x99\xca\xbc"},
    {"EndsAtTheFirstNul", std::string("it's\0'hidden", 12), "it''s"},
    {"Megabyte", std::string(1 << 20, 'x'), std::string(1 << 20, 'x')},
    {"MegabyteOfQuotes", std::string(1 << 20, '\''), std::string(2 << 20, '\'')},
};

INSTANTIATE_TEST_SUITE_P(Utilities, QuotingTest, ::testing::ValuesIn(kQuotings),
                         support::CaseName());

TEST(LikePredicateTest, WrapsTheValueInWildcards) {
  EXPECT_EQ(getSQLFormatLikeStr("msg", "a'b"), "msg like '%a''b%'");
  EXPECT_EQ(getSQLFormatLikeStr("msg", "50%"), "msg like '%50%%'");
  EXPECT_EQ(getSQLFormatLikeStr("msg", ""), "msg like '%%'");
}

TEST(LikePredicateTest, ColumnGoesInAsItStands) {
  EXPECT_EQ(getSQLFormatLikeStr("lower(msg)", "a"), "lower(msg) like '%a%'");
  EXPECT_EQ(getSQLFormatLikeStr("it's", "a"), "it's like '%a%'");
  EXPECT_EQ(getSQLFormatLikeStr("%q%s", "a"), "%q%s like '%a%'");
  EXPECT_EQ(getSQLFormatLikeStr("", "a"), " like '%a%'");
  EXPECT_EQ(getSQLFormatLikeStr(std::string("msg\0x", 5), "a"), "msg like '%a%'");
}

// In the engine ---------------------------------------------------------------

class SqlTextTest : public support::World {
 protected:
  static std::string matches(const std::string& text, const std::string& pattern) {
    return sqlText("SELECT count(*) FROM (SELECT '" + getSQLFormatStr(text) + "' AS msg) WHERE " +
                   getSQLFormatLikeStr("msg", pattern));
  }
};

TEST_F(SqlTextTest, QuotedTextIsReadBackAsItWas) {
  for (const char* text : {"it's", "'", "''';--", "100%_\\", "\xf0\x9f\x94\x91'"}) {
    EXPECT_EQ(sqlText("SELECT '" + getSQLFormatStr(text) + "'"), text);
  }
}

TEST_F(SqlTextTest, LikeFindsTheValueAnywhere) {
  EXPECT_EQ(matches("one it's two", "it's"), "1");
  EXPECT_EQ(matches("one its two", "it's"), "0");
}

TEST_F(SqlTextTest, WildcardsInTheValueStayWildcards) {
  EXPECT_EQ(matches("abc", "a_c"), "1");
  EXPECT_EQ(matches("a, long after, c", "a%c"), "1");
  EXPECT_EQ(matches("anything", "%"), "1");
}

// Out of memory ---------------------------------------------------------------

class SqlTextMemoryTest : public support::World {
 protected:
  void TearDown() override {
    sqlite3_hard_heap_limit64(0);
    World::TearDown();
  }

  /// SQLite has room for a few bytes more than it holds.
  static void leaveNoMemory() {
    sqlite3_initialize();
    sqlite3_hard_heap_limit64(sqlite3_memory_used() + 1024);
  }

  static void expectFailureLine() {
    const std::vector<support::LogLine> lines = SystemLog::lines();
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_EQ(lines[0].priority, 3);
    EXPECT_EQ(lines[0].source(), "oauth_utils");
    EXPECT_GT(lines[0].number(), 0);
    EXPECT_EQ(lines[0].format, "%s:%d Can't transfer to SQL format");
  }

  const std::string kBigText = std::string(1 << 20, 'x');
};

TEST_F(SqlTextMemoryTest, QuotingGivesAnEmptyTextAndALine) {
  leaveNoMemory();
  EXPECT_EQ(getSQLFormatStr(kBigText), "");
  expectFailureLine();
}

TEST_F(SqlTextMemoryTest, LikeGivesAnEmptyTextAndALine) {
  leaveNoMemory();
  EXPECT_EQ(getSQLFormatLikeStr("msg", kBigText), "");
  expectFailureLine();
}

TEST_F(SqlTextMemoryTest, FailureLeavesNothingBehind) {
  leaveNoMemory();
  const auto before = sqlite3_memory_used();
  getSQLFormatStr(kBigText);
  sqlite3_hard_heap_limit64(0);
  EXPECT_EQ(getSQLFormatStr("it's"), "it''s");
  EXPECT_EQ(sqlite3_memory_used(), before);
}

TEST_F(SqlTextMemoryTest, CopyThatFailsGivesAnEmptyTextAndALine) {
  const auto before = sqlite3_memory_used();
  std::string quoted = "untouched";
  {
    const support::FailingAllocation failing(1);
    quoted = getSQLFormatStr(kBigText);
  }
  ASSERT_TRUE(support::FailingAllocation::happened());
  EXPECT_EQ(quoted, "");
  expectFailureLine();
  EXPECT_EQ(sqlite3_memory_used(), before);
}

TEST_F(SqlTextMemoryTest, LikeCopyThatFailsGivesAnEmptyTextAndALine) {
  std::string predicate = "untouched";
  {
    const support::FailingAllocation failing(1);
    predicate = getSQLFormatLikeStr("msg", kBigText);
  }
  ASSERT_TRUE(support::FailingAllocation::happened());
  EXPECT_EQ(predicate, "");
  expectFailureLine();
}

TEST_F(SqlTextMemoryTest, SuccessIsNotLoggedAtAnyLevel) {
  withDiagnostics(-1, [] {
    getSQLFormatStr("it's");
    getSQLFormatLikeStr("msg", "it's");
  });
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

}  // namespace
