// Texts on their way into the stores and out again.

#include "grants/rows/quotes.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace {

using namespace KELDOAUTHSERVER::grants::rows;
using ::testing::ElementsAre;

TEST(QuotesTest, TextsComeBackAsTheyWere) {
  for (const char* text : {"", "plain", "O'Brien", "'", "''", "'''", "a''b'c", "'tis '"}) {
    EXPECT_EQ(undoubled(doubled(text)), text);
  }
}

TEST(QuotesTest, StoredTextHasEachQuoteTwice) {
  EXPECT_EQ(doubled("O'Brien's"), "O''Brien''s");
}

TEST(QuotesTest, ATextThatAnEditStoredAsGivenComesOutRight) {
  EXPECT_EQ(undoubled("O'Brien"), "O'Brien");
}

TEST(QuotesTest, ANameIsFoundInBothSpellings) {
  EXPECT_THAT(spellings("O'Brien"), ElementsAre("O''Brien", "O'Brien"));
}

TEST(QuotesTest, ANameWithoutQuotesHasOneSpelling) {
  EXPECT_THAT(spellings("alice"), ElementsAre("alice"));
}

TEST(QuotesTest, ANameThatIsAnothersSpellingIsNotFoundAsGiven) {
  EXPECT_THAT(spellings("O''Brien"), ElementsAre("O''''Brien"));
}

TEST(QuotesTest, EverySpellingReadsAsTheName) {
  for (const char* name : {"alice", "O'Brien", "O''Brien", "'''", "''a'"}) {
    for (const std::string& stored : spellings(name)) EXPECT_EQ(undoubled(stored), name);
  }
}

TEST(QuotesTest, ALiteralCannotBeLeft) {
  EXPECT_EQ(literal("x' OR '1'='1"), "'x'' OR ''1''=''1'");
}

TEST(QuotesTest, AListOfLiteralsIsACondition) {
  EXPECT_EQ(isOneOf("username", {"a", "b'"}), "(username IN ('a','b'''))");
}

}  // namespace
