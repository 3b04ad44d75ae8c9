// Operations that generate identifiers, when the system's random source fails
// or repeats itself.

#include <gmock/gmock.h>
#include <json/value.h>

#include <cerrno>
#include <cstring>
#include <functional>
#include <ostream>
#include <string>

#include "tests/stores/text_operations.h"
#include "tests/utils/kernel.h"
#include "utils/oauth_utils.h"

using ::testing::ElementsAre;
using ::testing::IsEmpty;

namespace {

struct Generator {
  const char* name;
  const char* table;
  const char* source;
  std::function<Aftermath(Json::Value& out)> run;
  std::size_t pieces;  // of 32 characters each
};
void PrintTo(const Generator& generator, std::ostream* out) {
  *out << generator.name;
}

const Generator kGenerators[] = {
    {"ClientAddGenerated", "oauth_clientInfo", "oauth_clientInfo",
     [](Json::Value& out) { return addGeneratedClient({}, out); }, 4},
    {"ClientAddWithSecret", "oauth_clientInfo", "oauth_clientInfo",
     [](Json::Value& out) { return addClientWithSecret({}, out); }, 2},
    {"CodeIssue", "oauth_grantCode", "oauth_grantCode",
     [](Json::Value& out) { return issueCode({}, out); }, 2},
    {"TokenIssue", "oauth_token", "oauth_token",
     [](Json::Value& out) { return issueToken({}, out); }, 4},
};

class RandomSourceTest : public StoreTest {
 protected:
  void SetUp() override {
    StoreTest::SetUp();
    Kernel::release();
  }
  void TearDown() override {
    Kernel::release();
    StoreTest::TearDown();
  }

  /// The n-th call fills everything with n, up to the one that fails and all
  /// after it.
  static void failFrom(std::size_t call) {
    Kernel::release();
    Kernel::refuseRandomDevice(EIO);
    Kernel::scriptGetrandom([call](char* buffer, std::size_t size) {
      const std::size_t n = Kernel::getrandomCalls().size();
      if (n >= call) {
        errno = EIO;
        return ssize_t{-1};
      }
      std::memset(buffer, static_cast<int>(n), size);
      return static_cast<ssize_t>(size);
    });
  }

  static void countUp() { failFrom(1000); }
};

class FailingSourceTest : public RandomSourceTest,
                          public ::testing::WithParamInterface<Generator> {};

TEST_P(FailingSourceTest, StoresNothing) {
  for (std::size_t call = 1; call <= GetParam().pieces; ++call) {
    failFrom(call);
    Json::Value out;
    const Aftermath outcome = GetParam().run(out);
    EXPECT_TRUE(failed(outcome, 7, "out of memory")) << call;
    EXPECT_THAT(outcome.lines,
                ElementsAre(std::string(GetParam().source) +
                            " Unexpected failure[system random source: Input/output error]"));
    EXPECT_THAT(outcome.statements, IsEmpty());
    EXPECT_TRUE(out.isNull());
    EXPECT_EQ(rowCount(GetParam().table), 0);
  }
}

TEST_P(FailingSourceTest, IsForgottenWhenItWorksAgain) {
  failFrom(1);
  Json::Value out;
  GetParam().run(out);
  Kernel::release();
  EXPECT_TRUE(succeeded(GetParam().run(out)));
  EXPECT_EQ(rowCount(GetParam().table), 1);
}

TEST_P(FailingSourceTest, IsAskedOnceForEachPiece) {
  countUp();
  Json::Value out;
  EXPECT_TRUE(succeeded(GetParam().run(out)));
  EXPECT_EQ(Kernel::getrandomCalls().size(), GetParam().pieces);
}

TEST_P(FailingSourceTest, ThatRepeatsItselfMeetsTheUniqueColumn) {
  Json::Value out;
  countUp();
  EXPECT_TRUE(succeeded(GetParam().run(out)));
  countUp();
  const Aftermath outcome = GetParam().run(out);
  EXPECT_FALSE(outcome.ok);
  EXPECT_EQ(outcome.code, 19);
  EXPECT_EQ(rowCount(GetParam().table), 1);
}

INSTANTIATE_TEST_SUITE_P(Stores, FailingSourceTest, ::testing::ValuesIn(kGenerators),
                         ::testing::PrintToStringParamName());

/// The two texts that come of a source that counts up, in order.
std::pair<std::string, std::string> firstTwoTexts() {
  const std::string first = KELDOAUTHSERVER::getRandomStr(64);
  return {first, KELDOAUTHSERVER::getRandomStr(64)};
}

TEST_F(RandomSourceTest, ClientIdentifierIsDrawnBeforeTheSecret) {
  countUp();
  const auto [first, second] = firstTwoTexts();
  countUp();
  Json::Value out;
  ASSERT_TRUE(succeeded(addGeneratedClient({}, out)));
  EXPECT_EQ(out["client_id"].asString(), first);
  EXPECT_EQ(out["client_secret"].asString(), second);
}

TEST_F(RandomSourceTest, AccessTokenIsDrawnBeforeTheRefreshToken) {
  countUp();
  const auto [first, second] = firstTwoTexts();
  countUp();
  Json::Value out;
  ASSERT_TRUE(succeeded(issueToken({}, out)));
  EXPECT_EQ(out["access_token"].asString(), first);
  EXPECT_EQ(out["refresh_token"].asString(), second);
}

TEST_F(RandomSourceTest, OperationsThatGenerateNothingDoNotAskIt) {
  failFrom(1);
  EXPECT_TRUE(succeeded(addClient()));
  EXPECT_TRUE(succeeded(addCode()));
  EXPECT_TRUE(succeeded(addToken()));
  EXPECT_THAT(Kernel::getrandomCalls(), IsEmpty());
}

}  // namespace
