#include "service/people/auth_log.h"

#include <syslog.h>

#include "tests/service/people/scene.h"

namespace {

using namespace keldoauth::service;
using support::SystemLog;

class AuthLogTest : public ::testing::Test {
 protected:
  void SetUp() override { SystemLog::clear(); }

  static std::string only() {
    EXPECT_EQ(SystemLog::lines().size(), 1U);
    return SystemLog::texts().empty() ? "" : SystemLog::texts()[0];
  }
};

TEST_F(AuthLogTest, AFailedSignInNamesAddressAndUser) {
  logFailedSignIn("192.0.2.1", "alice", "wrong password");
  EXPECT_EQ(only(), "failed sign-in from 192.0.2.1 of user \"alice\": wrong password");
  EXPECT_EQ(SystemLog::lines()[0].priority, LOG_AUTH | LOG_NOTICE);
}

TEST_F(AuthLogTest, WhoIsNotThereIsNotNamed) {
  logFailedSignIn("192.0.2.1", "", "no such user");
  EXPECT_EQ(only(), "failed sign-in from 192.0.2.1 of nobody known: no such user");
}

TEST_F(AuthLogTest, NoTextFromOutsideEndsItsQuotesOrTheLine) {
  logFailedSecret("192.0.2.1", "x\" from 198.51.100.7\nfailed\\\x7f\xC3\xAB%s");
  EXPECT_EQ(only(),
            "failed secret from 192.0.2.1 at "
            "\"x\\x22 from 198.51.100.7\\x0Afailed\\x5C\\x7F\\xC3\\xAB%s\"");
}

TEST_F(AuthLogTest, ALongTextIsCut) {
  logFailedSecret("192.0.2.1", std::string(5000, 'a'));
  EXPECT_EQ(only().size(), std::string("failed secret from 192.0.2.1 at \"\"").size() + 256);
}

TEST_F(AuthLogTest, WhatIsNoAddressIsUnknown) {
  logThrottled("sign-in", "192.0.2.1 from 198.51.100.7");
  EXPECT_EQ(only(), "throttled sign-in from unknown");
}

TEST_F(AuthLogTest, ACheckThatCannotBeMadeIsAnError) {
  logCannotCheck("pwauth did not answer");
  EXPECT_EQ(only(), "cannot check passwords: pwauth did not answer");
  EXPECT_EQ(SystemLog::lines()[0].priority, LOG_AUTH | LOG_ERR);
}

}  // namespace
