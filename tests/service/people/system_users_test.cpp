#include "service/people/system_users.h"

#include <pwd.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <functional>
#include <string>
#include <utility>

#include "tests/service/people/scene.h"

namespace {

using keldoauth::service::PasswordCheck;
using keldoauth::service::SystemUsers;
using keldoauth::service::Verdict;

bool isSystemBroken = false;

}  // namespace

/// The system's accounts are one, which it knows under two spellings.
extern "C" passwd* getpwnam(const char* name) {
  if (isSystemBroken) {
    errno = EIO;
    return nullptr;
  }
  errno = 0;
  static passwd account{};
  static char spelled[] = "alice";
  account.pw_name = spelled;
  account.pw_uid = 1001;
  const std::string text = name;
  return text == "alice" || text == "Alice" ? &account : nullptr;
}

namespace {

class SystemUsersTest : public scene::Folder {
 protected:
  void TearDown() override {
    isSystemBroken = false;
    Folder::TearDown();
  }

  PasswordCheck check(const std::string& script, const std::string& user = "alice",
                      const std::string& password = "secret") const {
    return SystemUsers(program(script)).checkPassword(user, password);
  }
};

TEST_F(SystemUsersTest, PwauthGetsNameAndPasswordEachOnALine) {
  EXPECT_EQ(check("cat > " + at("got"), "alice", " pass word ").verdict, Verdict::kYes);
  EXPECT_EQ(read("got"), "alice\n pass word \n");
}

TEST_F(SystemUsersTest, EveryStatusOfPwauthHasItsMeaning) {
  const std::pair<int, Verdict> table[] = {
      {0, Verdict::kYes},        {1, Verdict::kNo},         {2, Verdict::kNo},
      {3, Verdict::kNo},         {4, Verdict::kNo},         {5, Verdict::kNo},
      {6, Verdict::kCannotSay},  {7, Verdict::kNo},         {8, Verdict::kCannotSay},
      {50, Verdict::kCannotSay}, {51, Verdict::kCannotSay}, {52, Verdict::kCannotSay},
      {53, Verdict::kCannotSay}, {126, Verdict::kCannotSay}};
  for (const auto& [status, verdict] : table) {
    const PasswordCheck result = check("exit " + std::to_string(status));
    EXPECT_EQ(result.verdict, verdict) << status;
    EXPECT_EQ(result.why.empty(), verdict == Verdict::kYes) << status;
  }
}

TEST_F(SystemUsersTest, TheUserHasTheNameThatTheSystemSpells) {
  EXPECT_EQ(check("exit 0", "Alice").user, "alice");
}

TEST_F(SystemUsersTest, WhomTheSystemCannotNameIsNotLetIn) {
  EXPECT_EQ(check("exit 0", "bob").verdict, Verdict::kCannotSay);
  isSystemBroken = true;
  EXPECT_EQ(check("exit 0").verdict, Verdict::kCannotSay);
}

TEST_F(SystemUsersTest, WhatCouldBeTakenForAnotherQuestionIsNotAsked) {
  const std::string script = "touch " + at("asked");
  EXPECT_EQ(check(script, "alice\nsecret", "x").verdict, Verdict::kNo);
  EXPECT_EQ(check(script, std::string("alice\0", 6), "x").verdict, Verdict::kNo);
  EXPECT_EQ(check(script, "alice", "secret\nx").verdict, Verdict::kNo);
  EXPECT_EQ(check(script, "alice", std::string("secret\0x", 8)).verdict, Verdict::kNo);
  EXPECT_EQ(check(script, "alice", std::string(512, 'x')).verdict, Verdict::kNo);
  EXPECT_EQ(check(script, "alice", "").verdict, Verdict::kNo);
  EXPECT_EQ(check(script, "", "secret").verdict, Verdict::kNo);
  EXPECT_EQ(names(), std::vector<std::string>{"program"});
}

TEST_F(SystemUsersTest, AMissingOrSlowPwauthIsNoNo) {
  EXPECT_EQ(SystemUsers(at("missing")).checkPassword("alice", "secret").verdict,
            Verdict::kCannotSay);
  const SystemUsers hasty(program("exec sleep 600"), std::chrono::milliseconds(100));
  EXPECT_EQ(hasty.checkPassword("alice", "secret").verdict, Verdict::kCannotSay);
}

TEST_F(SystemUsersTest, TheStampIsTheAccountsNumber) {
  const SystemUsers users;
  EXPECT_EQ(users.stampOf("alice"), "1001");
  EXPECT_EQ(users.stampOf("Alice"), std::nullopt);
  EXPECT_EQ(users.stampOf("bob"), std::nullopt);
  EXPECT_EQ(users.stampOf("alice\n"), std::nullopt);
}

TEST_F(SystemUsersTest, ALookUpThatFailsIsNoAbsence) {
  isSystemBroken = true;
  EXPECT_THROW((void)SystemUsers().stampOf("alice"), keldoauth::service::DirectoryTrouble);
}

TEST_F(SystemUsersTest, TheProblemNamesWhatIsWrongWithPwauth) {
  EXPECT_THAT(SystemUsers(at("missing")).problem(), ::testing::HasSubstr("is missing"));
  EXPECT_THAT(SystemUsers(program("")).problem(), ::testing::HasSubstr("does not run as root"));
}

/// Runs `body` as the user nobody without the way back; its result is an exit
/// status.
int asNobody(const std::function<int()>& body) {
  const pid_t child = fork();
  if (child == 0) {
    const bool isReady =
        prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0 && (geteuid() != 0 || seteuid(65534) == 0);
    _exit(isReady ? body() : 99);
  }
  int status = 0;
  waitpid(child, &status, 0);
  return WEXITSTATUS(status);
}

TEST_F(SystemUsersTest, WithoutWaysToRootsRightsNothingIsSaidOfPasswords) {
  const std::string script = program("exit 1");
  EXPECT_EQ(asNobody([&] {
              const PasswordCheck result = SystemUsers(script).checkPassword("alice", "secret");
              return static_cast<int>(result.verdict);
            }),
            static_cast<int>(Verdict::kCannotSay));
}

}  // namespace
