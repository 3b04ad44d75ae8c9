#include "service/people/slow_down.h"

#include <cstdlib>
#include <filesystem>
#include <string>

#include "service/program/routes.h"
#include "service/protocol/endpoints.h"
#include "tests/service/service_test.h"

namespace {

using namespace service_test;
using support::Clock;
using support::SystemLog;

class SlowDownTest : public ServiceTest {
 protected:
  void SetUp() override {
    World::SetUp();
    std::string folder = "/tmp/slow-down.XXXXXX";
    ASSERT_NE(mkdtemp(folder.data()), nullptr);
    folder_ = folder;
    settings.countersFile = folder_ + "/counters";
    Clock::setTo(1700000000);
    SystemLog::clear();
  }
  void TearDown() override {
    std::filesystem::remove_all(folder_);
    World::TearDown();
  }

  Answer after(int status, const std::string& peer = "192.0.2.1") {
    Request request = post("/oauth/token", "client_id=a&client_secret=b");
    request.peer = peer;
    return afterSecret(settings, request, plainAnswer(status));
  }

 private:
  std::string folder_;
};

TEST_F(SlowDownTest, WrongSecretsAreAnsweredMoreSlowlyAfterTwenty) {
  for (int i = 0; i < 20; ++i) EXPECT_EQ(after(401).status, 401);
  const Answer answer = after(401);
  EXPECT_EQ(answer.status, 429);
  EXPECT_EQ(header(answer, "Retry-After"), "5");
  EXPECT_EQ(error(answer), "429 slow_down");
  EXPECT_EQ(after(401, "192.0.2.2").status, 401);
  Clock::advance(5);
  EXPECT_EQ(after(401).status, 401);
}

TEST_F(SlowDownTest, TheRightSecretIsAlwaysServed) {
  for (int i = 0; i < 50; ++i) after(401);
  EXPECT_EQ(after(200).status, 200);
  EXPECT_EQ(after(400).status, 400);
}

TEST_F(SlowDownTest, EveryFailureIsLogged) {
  for (int i = 0; i < 21; ++i) after(401);
  EXPECT_EQ(SystemLog::texts().front(), "failed secret from 192.0.2.1 at \"/oauth/token\"");
  EXPECT_EQ(SystemLog::texts().back(), "throttled secret from 192.0.2.1");
}

TEST_F(SlowDownTest, WhoShowsNothingHasTriedNothing) {
  for (int i = 0; i < 30; ++i) {
    EXPECT_EQ(afterSecret(settings, get("/oauth/register/x"), plainAnswer(401)).status, 401);
  }
  EXPECT_TRUE(SystemLog::lines().empty());
}

TEST_F(SlowDownTest, ARegistrationTooManyHasToWait) {
  const Request request = withBearer(kInitialToken, post("/oauth/register", "{}"));
  for (int i = 0; i < 60; ++i) EXPECT_EQ(call(registerApplication, request).status, 400);
  const Answer answer = call(registerApplication, request);
  EXPECT_EQ(answer.status, 429);
  EXPECT_EQ(header(answer, "Retry-After"), "60");
}

TEST_F(SlowDownTest, WithoutTheTokenNobodyUsesUpRegistrations) {
  const Request request = withBearer("wrong", post("/oauth/register", "{}"));
  for (int i = 0; i < 100; ++i) EXPECT_EQ(call(registerApplication, request).status, 401);
}

TEST_F(SlowDownTest, EveryRouteThatAsksForASecretCounts) {
  for (const char* path : {"/oauth/token", "/oauth/par", "/oauth/introspect", "/oauth/revoke",
                           "/oauth/register", "/oauth/register/x"}) {
    EXPECT_TRUE(routeOf(path, "")->asksSecret) << path;
  }
  for (const char* path : {"/api/whoami", "/oauth/authorize", "/oauth/sign-in", "/admin"}) {
    EXPECT_FALSE(routeOf(path, "")->asksSecret) << path;
  }
}

}  // namespace
