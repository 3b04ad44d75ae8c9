// How the library reads numbers out of columns: seen through a row count, whose
// trace shows the low 32 bits, and through the expiry of a token.

#include "utils/decimal.h"
#include "core/oauth_db_basic.h"
#include "stores/oauth_token.h"
#include "tests/support/case_name.h"
#include "tests/support/world.h"
#include "utils/oauth_names.h"

namespace {

using namespace KELDOAUTHSERVER;
using support::Clock;
using support::Platform;
using support::SystemLog;
using ::testing::ElementsAre;

struct Number {
  const char* name;
  const char* literal;  // in SQL
  const char* low32;
};

void PrintTo(const Number& number, std::ostream* out) {
  *out << number.literal;
}

TEST(DecimalValueTest, NumbersAreReadAsTheirTexts) {
  EXPECT_EQ(decimalValue(Json::Value(7)), 7);
  EXPECT_EQ(decimalValue(Json::Value(-7)), -7);
  EXPECT_EQ(decimalValue(Json::Value(Json::Value::maxInt64)), Json::Value::maxInt64);
  EXPECT_EQ(decimalValue(Json::Value(true)), 0);
}

class DecimalTest : public support::World {};

class CountTextTest : public support::World, public ::testing::WithParamInterface<Number> {};

TEST_P(CountTextTest, IsReadAsStrtollDoes) {
  OAUTHDBBasic store;
  // The count of no group at all is no row, which leaves the literal as the first.
  store.SetTabName(std::string("oauth_log WHERE 0 GROUP BY id UNION ALL SELECT ") +
                   GetParam().literal);
  SystemLog::clear();
  withDiagnostics(1, [&] { store.DBCheckRowMax(1); });
  EXPECT_THAT(SystemLog::messages(),
              ElementsAre(std::string("Table Row Count[") + GetParam().low32 + "]"));
}

const Number kNumbers[] = {
    {"Integer", "42", "42"},
    {"Text", "'42'", "42"},
    {"LeadingBlanks", "' ' || char(9, 10, 13) || '42'", "42"},
    {"LeadingZeros", "'0042'", "42"},
    {"PlusSign", "'+42'", "42"},
    {"MinusSign", "'-1'", "4294967295"},
    {"TwoSigns", "'--1'", "0"},
    {"SignAndBlank", "'+ 1'", "0"},
    {"TrailingText", "'42x7'", "42"},
    {"TrailingBlanks", "'42  '", "42"},
    {"Fraction", "'42.9'", "42"},
    {"Real", "4.5", "4"},
    {"Exponent", "'1e3'", "1"},
    {"Hexadecimal", "'0x10'", "0"},
    {"GroupedDigits", "'1,000'", "1"},
    {"OtherDigits", "char(0xff11, 0xff12)", "0"},
    {"NoDigits", "'many'", "0"},
    {"Empty", "''", "0"},
    {"Null", "NULL", "0"},
    {"Above32Bits", "'4294967299'", "3"},
    {"Highest", "'9223372036854775807'", "4294967295"},
    {"SaturatesAbove", "'99999999999999999999'", "4294967295"},
    {"Lowest", "'-9223372036854775808'", "0"},
    {"SaturatesBelow", "'-99999999999999999999'", "0"},
};

INSTANTIATE_TEST_SUITE_P(Utilities, CountTextTest, ::testing::ValuesIn(kNumbers),
                         support::CaseName());

TEST_F(DecimalTest, CountThatWrapsTo32BitsIsComparedAsSuch) {
  OAUTHDBBasic store;
  store.SetTabName("oauth_log WHERE 0 GROUP BY id UNION ALL SELECT '4294967299'");
  EXPECT_EQ(store.DBCheckRowMax(3), 0);
  EXPECT_EQ(store.DBCheckRowMax(4), 1);
}

// Expiry ----------------------------------------------------------------------

struct Expiry {
  const char* name;
  const char* text;
  bool valid;  // at second 1000
};

void PrintTo(const Expiry& expiry, std::ostream* out) {
  *out << '"' << expiry.text << '"';
}

class ExpiryTextTest : public support::World, public ::testing::WithParamInterface<Expiry> {};

TEST_P(ExpiryTextTest, IsReadAsA64BitNumber) {
  Platform::useReadableCipher();
  Clock::setTo(1000);
  OAUTHDBToken tokens(names::kTokenTable);
  sql("INSERT INTO oauth_token VALUES('u', '<c>', 's', 'r', '" + support::id64('a') + "', '" +
      GetParam().text + "', 'f', 'st', 'None', 1)");
  Json::Value result;
  EXPECT_EQ(tokens.Verify(support::id64('a'), result), GetParam().valid);
}

const Expiry kExpiries[] = {
    {"ThisSecond", "1000", true},
    {"LastSecond", "999", false},
    {"BlankAndSign", " +1000", true},
    {"TrailingText", "1000 s", true},
    {"Negative", "-1000", false},
    {"Empty", "", false},
    {"Never", "never", false},
    {"Exponent", "1e9", false},
    {"Hexadecimal", "0xffff", false},
    {"LowBitsBelow", "4294967296", true},
    {"Above64Bits", "99999999999999999999", true},
    {"Below64Bits", "-99999999999999999999", false},
};

INSTANTIATE_TEST_SUITE_P(Utilities, ExpiryTextTest, ::testing::ValuesIn(kExpiries),
                         support::CaseName());

}  // namespace
