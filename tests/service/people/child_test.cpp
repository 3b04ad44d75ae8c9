#include "service/people/child.h"

#include <fcntl.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdlib>
#include <optional>

#include "tests/service/people/scene.h"

namespace {

using keldoauth::service::exitStatusOf;
using keldoauth::service::kMaxQuestionBytes;

constexpr std::chrono::seconds kPatience{30};

class ChildTest : public scene::Folder {
 protected:
  std::optional<int> run(const std::string& script, const std::string& question = "") const {
    return exitStatusOf(program(script), question, kPatience);
  }
};

TEST_F(ChildTest, ReturnsTheExitStatus) {
  EXPECT_EQ(run("exit 0"), 0);
  EXPECT_EQ(run("exit 53"), 53);
}

TEST_F(ChildTest, HandsTheQuestionOverAsStandardInputWithItsEnd) {
  const std::string question = std::string("alice\n") + std::string(kMaxQuestionBytes - 6, 'x');
  EXPECT_EQ(run("cat > " + at("got"), question), 0);
  EXPECT_EQ(read("got"), question);
}

TEST_F(ChildTest, AQuestionThatNoPipeHoldsIsNotAsked) {
  EXPECT_EQ(run("touch " + at("ran"), std::string(kMaxQuestionBytes + 1, 'x')), std::nullopt);
  EXPECT_EQ(names(), std::vector<std::string>{"program"});
}

TEST_F(ChildTest, AProgramThatReadsNothingDoesNoHarm) {
  EXPECT_EQ(run("exec <&-; exit 1", std::string(kMaxQuestionBytes, 'x')), 1);
}

TEST_F(ChildTest, TheEnvironmentIsEmpty) {
  ASSERT_EQ(setenv("LEAKED", "secret", 1), 0);
  EXPECT_EQ(run("tr '\\0' '\\n' < /proc/$$/environ > " + at("environment")), 0);
  EXPECT_EQ(read("environment"), "");
  unsetenv("LEAKED");
}

TEST_F(ChildTest, NoDescriptorOfOursGoesAlong) {
  const int leaky = open("/dev/null", O_RDONLY);
  ASSERT_EQ(fcntl(leaky, F_DUPFD, 7), 7);
  ASSERT_EQ(fcntl(leaky, F_DUPFD, 77), 77);
  EXPECT_EQ(run("ls /proc/$$/fd > " + at("descriptors") + "; exit 0"), 0);
  close(7);
  close(77);
  close(leaky);
  // 10 and above, one after the other, are the shell's own.
  EXPECT_THAT(read("descriptors"), ::testing::MatchesRegex("0\n1\n(1.\n)*2\n"));
}

/// Whoever starts the service may open them first and lower the limit then.
TEST_F(ChildTest, DescriptorsAboveTheLimitDoNotGoAlongEither) {
  const int high = fcntl(STDERR_FILENO, F_DUPFD, 400);
  rlimit before{};
  getrlimit(RLIMIT_NOFILE, &before);
  const rlimit lower{300, before.rlim_max};
  setrlimit(RLIMIT_NOFILE, &lower);
  const std::optional<int> status =
      run("[ -e /proc/$$/fd/0 ] && [ ! -e /proc/$$/fd/" + std::to_string(high) + " ]");
  setrlimit(RLIMIT_NOFILE, &before);
  close(high);
  EXPECT_EQ(status, 0);
}

TEST_F(ChildTest, WorksWithoutStandardDescriptors) {
  const std::string script = program("cat > " + at("got") + "; exit 7");
  const pid_t child = fork();
  ASSERT_GE(child, 0);
  if (child == 0) {
    for (int i = 0; i < 3; ++i) close(i);
    _exit(exitStatusOf(script, "question", kPatience).value_or(99));
  }
  int status = 0;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_EQ(WEXITSTATUS(status), 7);
  EXPECT_EQ(read("got"), "question");
}

TEST_F(ChildTest, WhatIsPrintedIsLost) {
  testing::internal::CaptureStdout();
  EXPECT_EQ(run("echo noise; echo noise >&2; exit 0"), 0);
  EXPECT_EQ(testing::internal::GetCapturedStdout(), "");
}

TEST_F(ChildTest, SignalsThatThisProcessIgnoresAreNotIgnoredThere) {
  const auto before = std::signal(SIGTERM, SIG_IGN);
  EXPECT_EQ(run("kill -TERM $$; exit 0"), std::nullopt);
  std::signal(SIGTERM, before);
}

TEST_F(ChildTest, SeesTheStatusEvenWhereSigchldIsIgnored) {
  const auto before = std::signal(SIGCHLD, SIG_IGN);
  EXPECT_EQ(run("exit 5"), 5);
  EXPECT_EQ(std::signal(SIGCHLD, before), SIG_IGN);
}

TEST_F(ChildTest, AProgramThatCannotBeStartedIsNoAnswer) {
  EXPECT_EQ(exitStatusOf(at("missing"), "", kPatience), std::nullopt);
  write("text", "no program", 0600);
  EXPECT_EQ(exitStatusOf(at("text"), "", kPatience), std::nullopt);
}

TEST_F(ChildTest, ASignalIsNoAnswer) {
  EXPECT_EQ(run("kill -9 $$"), std::nullopt);
}

TEST_F(ChildTest, AProgramThatDoesNotEndIsKilledAndGone) {
  const std::string script = program("echo $$ > " + at("pid") + "; exec sleep 600");
  EXPECT_EQ(exitStatusOf(script, "", std::chrono::milliseconds(300)), std::nullopt);
  EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1);
  EXPECT_EQ(errno, ECHILD);
}

}  // namespace
