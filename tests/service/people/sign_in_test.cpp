#include "service/people/sign_in.h"

#include <sys/wait.h>
#include <unistd.h>

#include <functional>

#include "tests/service/people/scene.h"

namespace {

using keldoauth::service::signIn;
using keldoauth::service::SignInEnd;
using keldoauth::service::SignInOutcome;
using keldoauth::service::Throttle;
using support::Clock;
using support::SystemLog;

class SignInTest : public scene::Folder {
 protected:
  void SetUp() override {
    Folder::SetUp();
    Clock::setTo(1700000000);
    directory_.people = {{"alice", {"right", "1"}}};
  }

  SignInOutcome attempt(const std::string& user, const std::string& password,
                        const std::string& peer = "192.0.2.1", const std::string& browser = "") {
    Throttle throttle(at("counters"), "key");
    return signIn(directory_, throttle, {user, password, peer, browser});
  }
  /// A new address for every try.
  SignInEnd guess(const std::string& user, const std::string& password = "wrong",
                  const std::string& browser = "") {
    ++addresses_;
    return attempt(user, password,
                   "198.51." + std::to_string(addresses_ / 256) + "." +
                       std::to_string(addresses_ % 256),
                   browser)
        .end;
  }

  scene::TestDirectory directory_;
  int addresses_ = 0;
};

TEST_F(SignInTest, TheRightPasswordLetsIn) {
  const SignInOutcome outcome = attempt("alice", "right");
  EXPECT_EQ(outcome.end, SignInEnd::kIn);
  EXPECT_EQ(outcome.user, "alice");
  EXPECT_TRUE(SystemLog::lines().empty());
}

TEST_F(SignInTest, AFailureIsLoggedWithTheAddress) {
  EXPECT_EQ(attempt("alice", "wrong").end, SignInEnd::kWrong);
  EXPECT_EQ(attempt("hunter2", "wrong").end, SignInEnd::kWrong);
  EXPECT_EQ(SystemLog::texts(),
            (std::vector<std::string>{
                "failed sign-in from 192.0.2.1 of user \"alice\": wrong name or password",
                "failed sign-in from 192.0.2.1 of nobody known: wrong name or password"}));
}

TEST_F(SignInTest, AnAddressThatGuessesHasToWaitAndIsNotAnswered) {
  for (int i = 0; i < 10; ++i) attempt("user" + std::to_string(i), "wrong");
  const int before = directory_.checks;
  const SignInOutcome outcome = attempt("alice", "right");
  EXPECT_EQ(outcome.end, SignInEnd::kTooOften);
  EXPECT_EQ(outcome.waitSeconds, 60);
  EXPECT_EQ(directory_.checks, before);
  EXPECT_EQ(SystemLog::texts().back(), "throttled sign-in from 192.0.2.1");
  EXPECT_EQ(attempt("alice", "right", "192.0.2.2").end, SignInEnd::kIn);
}

TEST_F(SignInTest, OneIpv6HouseholdIsOneAddress) {
  for (int i = 0; i < 10; ++i) {
    attempt("user" + std::to_string(i), "wrong", "2001:db8::" + std::to_string(i));
  }
  EXPECT_EQ(attempt("alice", "right", "2001:db8::ffff").end, SignInEnd::kTooOften);
  EXPECT_EQ(attempt("alice", "right", "2001:db8:0:1::1").end, SignInEnd::kIn);
}

TEST_F(SignInTest, GuessesAtAnAccountFromEverywhereHaveToWait) {
  for (int i = 0; i < 10; ++i) EXPECT_EQ(guess("alice"), SignInEnd::kWrong);
  EXPECT_EQ(guess("alice"), SignInEnd::kTooOften);
  EXPECT_EQ(guess("ALICE"), SignInEnd::kTooOften) << "case makes no new account";
  EXPECT_EQ(guess("alice", "right"), SignInEnd::kTooOften);
}

TEST_F(SignInTest, NobodysNameIsThrottledAsSomebodysIs) {
  for (int i = 0; i < 10; ++i) EXPECT_EQ(guess("carol"), SignInEnd::kWrong);
  EXPECT_EQ(guess("carol"), SignInEnd::kTooOften);
}

TEST_F(SignInTest, NoAccountIsLockedForLongerThanTenMinutes) {
  for (int i = 0; i < 30; ++i) guess("alice");
  Clock::advance(600);
  EXPECT_EQ(guess("alice", "right"), SignInEnd::kIn);
}

TEST_F(SignInTest, AKnownBrowserIsNotKeptOutByStrangers) {
  for (int i = 0; i < 30; ++i) guess("alice");
  EXPECT_EQ(guess("alice", "right", "browser"), SignInEnd::kIn);
}

TEST_F(SignInTest, AKnownBrowserGuessesNoMoreThanOthers) {
  for (int i = 0; i < 10; ++i) EXPECT_EQ(guess("alice", "wrong", "browser"), SignInEnd::kWrong);
  EXPECT_EQ(guess("alice", "right", "browser"), SignInEnd::kTooOften);
  EXPECT_EQ(guess("alice", "right"), SignInEnd::kIn) << "strangers have what is theirs";
}

TEST_F(SignInTest, SuccessGivesBackWhatItTookAndNoMore) {
  for (int i = 0; i < 100; ++i) EXPECT_EQ(attempt("alice", "right").end, SignInEnd::kIn);
  for (int i = 0; i < 9; ++i) attempt("alice", "wrong");
  for (int i = 0; i < 10; ++i) EXPECT_EQ(attempt("alice", "right").end, SignInEnd::kIn);
  attempt("alice", "wrong");
  EXPECT_EQ(attempt("alice", "right").end, SignInEnd::kTooOften);
}

TEST_F(SignInTest, WhatAThrottledAccountRefusesDoesNotCountForTheAddress) {
  for (int i = 0; i < 10; ++i) guess("alice");
  for (int i = 0; i < 50; ++i) EXPECT_EQ(attempt("alice", "right").end, SignInEnd::kTooOften);
  directory_.people["bob"] = {"right", "2"};
  EXPECT_EQ(attempt("bob", "right").end, SignInEnd::kIn);
}

TEST_F(SignInTest, ADirectoryThatCannotSayCostsNothing) {
  directory_.isBroken = true;
  for (int i = 0; i < 30; ++i) {
    EXPECT_EQ(attempt("alice", "right").end, SignInEnd::kCannotSay);
  }
  EXPECT_EQ(SystemLog::texts()[0], "cannot check passwords: broken");
  directory_.isBroken = false;
  EXPECT_EQ(attempt("alice", "right").end, SignInEnd::kIn);
}

/// A burst at one moment gets no more than the allowance.
TEST_F(SignInTest, TriesAtTheSameMomentAreCountedBeforeTheyAreChecked) {
  constexpr int kTries = 40;
  for (int i = 0; i < kTries; ++i) {
    if (fork() == 0) _exit(static_cast<int>(attempt("alice", "wrong").end));
  }
  int checked = 0;
  for (int i = 0; i < kTries; ++i) {
    int status = 0;
    wait(&status);
    checked += WEXITSTATUS(status) == static_cast<int>(SignInEnd::kWrong) ? 1 : 0;
  }
  EXPECT_LE(checked, 10);
  EXPECT_GE(checked, 1);
}

/// Each waits in its check for the next to end. A hundred would keep a hundred
/// processes busy.
TEST_F(SignInTest, TwoAreCheckedAtOnceOnTheWholeBox) {
  const auto inAnother = [this](const std::function<void()>& meanwhile) {
    const pid_t child = fork();
    if (child == 0) {
      directory_.meanwhile = meanwhile;
      _exit(static_cast<int>(attempt("alice", "right").end));
    }
    int status = 0;
    waitpid(child, &status, 0);
    return static_cast<SignInEnd>(WEXITSTATUS(status));
  };
  directory_.meanwhile = [&] {
    const SignInEnd second = inAnother([&] {
      if (inAnother([] {}) != SignInEnd::kTooOften) _exit(99);
    });
    EXPECT_EQ(second, SignInEnd::kIn);
  };
  EXPECT_EQ(attempt("alice", "right").end, SignInEnd::kIn);
  directory_.meanwhile = [] {};
  EXPECT_EQ(attempt("alice", "right").end, SignInEnd::kIn) << "the places are free again";
}

}  // namespace
