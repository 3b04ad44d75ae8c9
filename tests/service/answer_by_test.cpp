// What becomes of a request whose store fails, or is replaced under it.

#include <stdexcept>

#include "service/program/service.h"
#include "tests/service/service_test.h"

using ::testing::HasSubstr;

namespace {

using namespace service_test;
using grants::Trouble;

constexpr int kFullMedium = 13;  // SQLite's codes
constexpr int kBusy = 5;

/// Done by the endpoint in the middle of its first, or of every, request.
void (*meanwhile)() = nullptr;
int calls = 0;
bool isOnce = true;

Answer counts(Context& context, const Request& /*request*/) {
  const auto before = context.store.open().applications.all().size();
  if (++calls == 1 || !isOnce) meanwhile();
  const auto after = context.store.open().applications.all().size();
  return plainAnswer(200).with("X-Count", std::to_string(before) + " " + std::to_string(after));
}

Answer registers(Context& context, const Request& /*request*/) {
  grants::Grants& store = context.store.open();
  if (++calls == 1) meanwhile();
  const auto added = store.applications.add({grants::ApplicationName("App"),
                                             {grants::RedirectAddress(kCallback)},
                                             grants::Scope("profile")},
                                            grants::Actor("admin"));
  return plainAnswer(added ? 201 : 400);
}

Answer fails(Context& context, const Request& /*request*/) {
  context.store.open();
  ++calls;
  meanwhile();
  return plainAnswer(200);
}

Answer needsNoStore(Context& /*context*/, const Request& /*request*/) {
  ++calls;
  meanwhile();
  return plainAnswer(200);
}

void nothing() {}

class AnswerByTest : public ServiceTest {
 protected:
  void SetUp() override {
    ServiceTest::SetUp();
    calls = 0;
    isOnce = true;
    meanwhile = nothing;
  }

  Answer answer(Endpoint endpoint) {
    return answerBy(Route{"/x", endpoint, tellAsJson}, settings, store, get("/x"));
  }

  /// A file with `applications` under the name of the store's.
  static void replace(int applications) {
    std::rename(kDatabase, kOld);
    grants::Grants fresh;
    for (int i = 0; i < applications; ++i) {
      ASSERT_TRUE(fresh.applications.add(
          {grants::ApplicationName("App " + std::to_string(i)), {}, grants::Scope("profile")},
          grants::Actor("admin")));
    }
  }

  static constexpr char kOld[] = "/var/packages/Corvane/target/etc/old.db";
};

TEST_F(AnswerByTest, KeepsTheStoreForTheNextRequest) {
  answer(needsNoStore);
  store.startRequest();
  const grants::Grants* const first = &store.open();
  answer(counts);
  store.startRequest();
  EXPECT_EQ(&store.open(), first);
  EXPECT_EQ(calls, 2);
}

TEST_F(AnswerByTest, SeesAFileThatWasReplacedBetweenRequests) {
  EXPECT_EQ(header(answer(counts), "X-Count"), "0 0");
  replace(3);
  EXPECT_EQ(header(answer(counts), "X-Count"), "3 3");
}

TEST_F(AnswerByTest, MakesAFileThatWasRemoved) {
  answer(counts);
  unlink(kDatabase);
  EXPECT_EQ(header(answer(counts), "X-Count"), "0 0");
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_clientInfo"), "0");
}

TEST_F(AnswerByTest, LooksOnceMoreWhenTheFileWasReplacedMeanwhile) {
  meanwhile = [] { replace(2); };
  EXPECT_EQ(header(answer(counts), "X-Count"), "2 2");
  EXPECT_EQ(calls, 2);
}

TEST_F(AnswerByTest, ChangesTheNewFileWhenTheOldOneWasReplacedMeanwhile) {
  answer(counts);
  calls = 0;
  meanwhile = [] { replace(0); };
  EXPECT_EQ(answer(registers).status, 201);
  EXPECT_EQ(calls, 2);
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_clientInfo"), "1");
}

TEST_F(AnswerByTest, TriesNoThirdTime) {
  isOnce = false;
  meanwhile = [] { replace(1); };
  EXPECT_EQ(answer(counts).status, 200);
  EXPECT_EQ(calls, 2);
}

TEST_F(AnswerByTest, DoesNothingTwiceWithoutAStore) {
  meanwhile = [] { replace(0); };
  answer(needsNoStore);
  EXPECT_EQ(calls, 1);
}

TEST_F(AnswerByTest, TellsTroubleAndOpensAnew) {
  meanwhile = [] { throw Trouble(kFullMedium, "full"); };
  const Answer told = answer(fails);
  EXPECT_EQ(error(told), "500 server_error");
  EXPECT_EQ(header(told, "Retry-After"), "");
  meanwhile = nothing;
  EXPECT_EQ(answer(fails).status, 200);
  EXPECT_EQ(calls, 2);
}

TEST_F(AnswerByTest, AsksToComeAgainWhenTheStoreIsBusy) {
  meanwhile = [] { throw Trouble(kBusy, "locked"); };
  const Answer told = answer(fails);
  EXPECT_EQ(error(told), "503 temporarily_unavailable");
  EXPECT_EQ(header(told, "Retry-After"), "5");
}

TEST_F(AnswerByTest, AsksToComeAgainWhenMemoryRunsOut) {
  meanwhile = [] { throw std::bad_alloc(); };
  EXPECT_EQ(header(answer(fails), "Retry-After"), "5");
  meanwhile = nothing;
  EXPECT_EQ(answer(fails).status, 200);
}

TEST_F(AnswerByTest, SurvivesAnExceptionOfAnEndpoint) {
  meanwhile = [] { throw std::runtime_error("a secret"); };
  const Answer told = answer(fails);
  EXPECT_EQ(error(told), "500 server_error");
  EXPECT_THAT(told.body, ::testing::Not(HasSubstr("a secret")));
  meanwhile = nothing;
  EXPECT_EQ(answer(fails).status, 200);
}

TEST_F(AnswerByTest, TellsARefusalAsItIs) {
  meanwhile = [] { throw Refusal{plainAnswer(405)}; };
  EXPECT_EQ(answer(fails).status, 405);
  EXPECT_EQ(calls, 1);
}

}  // namespace
