// The codes of refusals and the kinds of trouble.

#include "grants/outcome.h"

#include <gtest/gtest.h>

#include <set>
#include <string>

#include "grants/trouble.h"

namespace {

using namespace KELDOAUTHSERVER::grants;

TEST(OutcomeTest, EachErrorHasTheCodeOfItsStandard) {
  EXPECT_STREQ(codeText(Error::kInvalidRequest), "invalid_request");
  EXPECT_STREQ(codeText(Error::kInvalidClient), "invalid_client");
  EXPECT_STREQ(codeText(Error::kInvalidGrant), "invalid_grant");
  EXPECT_STREQ(codeText(Error::kUnauthorizedClient), "unauthorized_client");
  EXPECT_STREQ(codeText(Error::kInvalidScope), "invalid_scope");
  EXPECT_STREQ(codeText(Error::kInvalidToken), "invalid_token");
  EXPECT_STREQ(codeText(Error::kInvalidRedirectUri), "invalid_redirect_uri");
  EXPECT_STREQ(codeText(Error::kInvalidClientMetadata), "invalid_client_metadata");
}

TEST(OutcomeTest, EachReasonHasASentenceOfItsOwn) {
  std::set<std::string> sentences;
  for (int why = 0; why <= static_cast<int>(Why::kTaken); ++why) {
    sentences.insert(explain(static_cast<Why>(why)));
  }
  EXPECT_EQ(sentences.size(), static_cast<std::size_t>(Why::kTaken) + 1);
}

TEST(OutcomeTest, ReasonsHaveOnlyCharactersOfADescription) {
  for (int why = 0; why <= static_cast<int>(Why::kTaken); ++why) {
    const std::string sentence = explain(static_cast<Why>(why));
    EXPECT_EQ(sentence.find_first_of("\"\\"), std::string::npos) << sentence;
  }
  EXPECT_STREQ(explain(Why::kReplayed),
               "It was used before; the access that came from it has been ended");
  EXPECT_STREQ(explain(Why::kTaken), "The identifier is taken");
}

TEST(OutcomeTest, HoldsAValueOrARefusal) {
  const Outcome<int> value(7);
  const Outcome<int> refused(Refusal{Error::kInvalidGrant, Why::kExpired});
  EXPECT_TRUE(value);
  EXPECT_EQ(*value, 7);
  EXPECT_FALSE(refused);
  EXPECT_EQ(refused.refusal().why, Why::kExpired);
  EXPECT_THROW(static_cast<void>(*refused), std::bad_variant_access);
  EXPECT_THROW(static_cast<void>(value.refusal()), std::bad_variant_access);
}

struct KindOfCode {
  int code;
  Trouble::Kind kind;
  bool canTryAgain;
};

TEST(TroubleTest, TheCodeTellsTheKindAndWhetherTryingAgainHelps) {
  const KindOfCode table[] = {
      {5, Trouble::Kind::kLocked, true},      {6, Trouble::Kind::kLocked, true},
      {-5, Trouble::Kind::kFull, false},      {8, Trouble::Kind::kMedium, false},
      {10, Trouble::Kind::kMedium, false},    {11, Trouble::Kind::kMedium, false},
      {13, Trouble::Kind::kMedium, false},    {26, Trouble::Kind::kMedium, false},
      {255, Trouble::Kind::kNotReady, false}, {-1, Trouble::Kind::kNotReady, false},
      {14, Trouble::Kind::kNotReady, false},  {-4, Trouble::Kind::kCipher, false},
      {7, Trouble::Kind::kMemory, true},      {1, Trouble::Kind::kOther, false},
  };
  for (const KindOfCode& row : table) {
    EXPECT_EQ(Trouble(row.code, "").kind(), row.kind) << row.code;
    EXPECT_EQ(Trouble(row.code, "").canTryAgain(), row.canTryAgain) << row.code;
  }
}

TEST(TroubleTest, CarriesCodeAndText) {
  const Trouble trouble(5, "database is locked");
  EXPECT_EQ(trouble.code(), 5);
  EXPECT_STREQ(trouble.what(), "database is locked");
}

}  // namespace
