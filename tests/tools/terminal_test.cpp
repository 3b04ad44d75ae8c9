// Questions, answers and secrets typed on a terminal, and secrets from files.

#include <sys/stat.h>

#include <thread>

#include "tests/tools/cli.h"

namespace cli {
namespace {

using testing::EndsWith;
using testing::HasSubstr;
using testing::Not;
using testing::StartsWith;

class Terminal : public CliTest {
 protected:
  void SetUp() override {
    CliTest::SetUp();
    addClient();
  }

  static Outcome addWithSecret(const std::string& file, const std::string& input = {}) {
    return run({"client", "add", "--redirect-uri", "app:/back", "--scope", "x", "--name", "y",
                "--secret-file", file},
               input);
  }
};

// Questions -----------------------------------------------------------------------

TEST_F(Terminal, AsksBeforeItRemoves) {
  const Outcome removed = runOnTerminal({"client", "remove", "1"}, {{"[y/N] ", "y\n"}});
  EXPECT_THAT(removed, ExitsWith(kOk));
  EXPECT_THAT(removed.out,
              StartsWith("Remove client 1 (Photo Frame) with its codes and tokens? [y/N] "));
  EXPECT_THAT(removed.out, EndsWith("Removed client 1 (Photo Frame) with 0 codes and 0 tokens.\n"));
  EXPECT_EQ(rowCount("oauth_clientInfo"), "0");
}

TEST_F(Terminal, EverythingButYesIsNo) {
  for (const std::string answer : {"n\n", "\n", "yeah\n", "no y\n", "\x04"}) {
    const Outcome kept = runOnTerminal({"client", "remove", "1"}, {{"[y/N] ", answer}});
    EXPECT_THAT(kept, ExitsWith(kNotConfirmed)) << answer;
    EXPECT_THAT(kept.out, HasSubstr("client remove: not confirmed, nothing was done\n"));
  }
  EXPECT_EQ(rowCount("oauth_clientInfo"), "1");
}

TEST_F(Terminal, YesInFull) {
  EXPECT_THAT(runOnTerminal({"client", "remove", "1"}, {{"[y/N] ", "yes\n"}}), ExitsWith(kOk));
}

TEST_F(Terminal, YesOnTheCommandLineAsksNothing) {
  const Outcome removed = runOnTerminal({"client", "remove", "1", "--yes"});
  EXPECT_EQ(removed.out, "Removed client 1 (Photo Frame) with 0 codes and 0 tokens.\n");
}

TEST_F(Terminal, TheQuestionIsNotPartOfTheDocument) {
  const Outcome removed = runOnTerminal({"client", "remove", "1", "--json"}, {{"[y/N] ", "y\n"}});
  EXPECT_THAT(removed.out, HasSubstr("\n{\"client\":"));
}

TEST_F(Terminal, EveryDestructiveCommandRefusesWithoutATerminal) {
  issueCode();
  issueToken();
  sql("UPDATE oauth_grantCode SET expired_time='5'; UPDATE oauth_token SET expired_time='5'");
  for (const Arguments& command :
       {Arguments{"client", "remove", "1"}, Arguments{"code", "revoke", "1"},
        Arguments{"code", "remove", "1"}, Arguments{"code", "purge"},
        Arguments{"code", "purge", "--grace", "1"}, Arguments{"token", "revoke", "1"},
        Arguments{"token", "purge"}, Arguments{"purge"}, Arguments{"log", "clear"},
        Arguments{"client", "revoke", "1"}, Arguments{"client", "renew-secret", "1"},
        Arguments{"token", "revoke", "1"}}) {
    const Outcome refused = run(command, "y\n");
    EXPECT_THAT(refused, ExitsWith(kNotConfirmed));
    EXPECT_THAT(refused.err, HasSubstr("not confirmed, nothing was done\nhint: there is no "
                                       "terminal to ask on; --yes goes ahead without asking\n"));
    EXPECT_EQ(refused.out, "");
  }
  for (const char* table : {"oauth_clientInfo", "oauth_grantCode", "oauth_token", "oauth_log"}) {
    EXPECT_EQ(rowCount(table), "1") << table;
  }
  EXPECT_EQ(sqlText("SELECT expired_time FROM oauth_grantCode"), "5");
}

TEST_F(Terminal, EveryDestructiveCommandSaysWhatItIsAbout) {
  issueCode();
  issueToken();
  struct Case {
    Arguments arguments;
    std::string question;
  };
  const std::vector<Case> cases{
      {{"code", "revoke", "1"}, "Revoke code 1 of alice? [y/N] "},
      {{"code", "remove", "1"}, "Remove code 1 of alice? [y/N] "},
      {{"token", "revoke", "1"}, "Revoke token 1 of alice? [y/N] "},
      {{"log", "clear"}, "Delete all 1 row of the audit log? [y/N] "},
  };
  for (const Case& asked : cases) {
    EXPECT_THAT(runOnTerminal(asked.arguments, {{"[y/N] ", "n\n"}}).out,
                StartsWith(asked.question));
  }
}

TEST_F(Terminal, PurgeSaysHowMany) {
  issueToken();
  issueToken();
  sql("UPDATE oauth_token SET expired_time='5'");
  const Outcome purged = runOnTerminal({"token", "purge"}, {{"[y/N] ", "y\n"}});
  EXPECT_THAT(purged.out, StartsWith("Purge 2 expired tokens? [y/N] "));
  EXPECT_EQ(rowCount("oauth_token"), "0");
}

TEST_F(Terminal, AQuestionShowsNoControlCharacters) {
  sql("UPDATE oauth_clientInfo SET display_name='a"
      "\x1b"
      "[2Jb'");
  const Outcome asked = runOnTerminal({"client", "remove", "1"}, {{"[y/N] ", "n\n"}});
  EXPECT_THAT(asked.out, StartsWith("Remove client 1 (a\\x1b[2Jb) with"));
}

struct Meanwhile {
  const char* what;
  Arguments command;
  const char* table;
  const char* change;
};

class RowThatChanged : public Terminal, public testing::WithParamInterface<Meanwhile> {};

/// Row ids are given out again: what was agreed to is not done to another row.
TEST_P(RowThatChanged, IsLeftAlone) {
  issueCode();
  issueToken();
  const std::string select = std::string("SELECT * FROM ") + GetParam().table;
  std::vector<support::Row> expected;
  const auto change = [&] {
    sql(GetParam().change);
    expected = sql(select);
  };
  const Outcome outcome = runOnTerminal(GetParam().command, {{"[y/N] ", "y\n", change}});
  EXPECT_THAT(outcome, ExitsWith(kNotFound));
  EXPECT_EQ(sql(select), expected);
}

INSTANTIATE_TEST_SUITE_P(
    Commands, RowThatChanged,
    testing::Values(
        Meanwhile{"ClientRemove",
                  {"client", "remove", "1"},
                  "oauth_clientInfo",
                  "UPDATE oauth_clientInfo SET client_id='another'"},
        Meanwhile{"CodeRemove",
                  {"code", "remove", "1"},
                  "oauth_grantCode",
                  "UPDATE oauth_grantCode SET code='another'"},
        Meanwhile{"CodeRevoke",
                  {"code", "revoke", "1"},
                  "oauth_grantCode",
                  "UPDATE oauth_grantCode SET code='another'"},
        Meanwhile{"TokenRevoke",
                  {"token", "revoke", "1"},
                  "oauth_token",
                  "UPDATE oauth_token SET access_token='another', state='another'"},
        Meanwhile{"TokenGone", {"token", "revoke", "1"}, "oauth_token", "DELETE FROM oauth_token"}),
    [](const auto& test) { return test.param.what; });

TEST_F(Terminal, ARowThatChangedIsNamed) {
  issueCode();
  const auto change = [] { sql("UPDATE oauth_grantCode SET code='x'"); };
  const Outcome outcome = runOnTerminal({"code", "revoke", "1"}, {{"[y/N] ", "y\n", change}});
  EXPECT_THAT(outcome.out, HasSubstr("keldoauth: code revoke: code 1 has just changed\n"
                                     "hint: nothing was done; look at it again\n"));
}

TEST_F(Terminal, OneOfSeveralThatChangedStays) {
  issueCode();
  issueCode();
  const auto change = [] { sql("UPDATE oauth_grantCode SET code='x' WHERE id=2"); };
  const Outcome outcome =
      runOnTerminal({"code", "revoke", "1", "2"}, {{"2 codes? [y/N] ", "y\n", change}});
  EXPECT_THAT(outcome, ExitsWith(kNotFound));
  EXPECT_THAT(outcome.out, HasSubstr("1 of 2 codes have just changed, and stay\n"));
  EXPECT_EQ(sqlText("SELECT id FROM oauth_grantCode"), "2");
}

TEST_F(Terminal, WhatIsEndedOfAUserIsCounted) {
  issueCode();
  issueToken();
  const Outcome asked = runOnTerminal({"user", "revoke", "alice"}, {{"[y/N] ", "n\n"}});
  EXPECT_THAT(asked.out, StartsWith("End all that alice has (2 rows)? [y/N] "));
  EXPECT_EQ(rowCount("oauth_token"), "1");
  EXPECT_THAT(runOnTerminal({"token", "revoke", "--username", "alice"}, {{"[y/N] ", "n\n"}}).out,
              StartsWith("Revoke 1 token of alice? [y/N] "));
}

TEST_F(Terminal, APurgeSparesARowThatWasRenewedMeanwhile) {
  issueToken();
  issueToken();
  sql("UPDATE oauth_token SET expired_time='5'");
  const auto renew = [] { expireIn("oauth_token", 2, 600); };
  const Outcome purged = runOnTerminal({"token", "purge"}, {{"[y/N] ", "y\n", renew}});
  EXPECT_THAT(purged.out, EndsWith("1 expired token purged.\n"));
  EXPECT_EQ(sqlText("SELECT id FROM oauth_token"), "2");
}

// Secrets on a terminal -------------------------------------------------------------

TEST_F(Terminal, ATypedTokenIsNotShown) {
  const std::string token = issueToken()["access_token"].asString();
  const Outcome verified = runOnTerminal({"token", "verify"}, {{"Access token: ", token + "\n"}});
  EXPECT_THAT(verified, ExitsWith(kOk));
  EXPECT_THAT(verified.out, StartsWith("Access token: \nValid.\n"));
  EXPECT_THAT(verified.out, Not(HasSubstr(token)));
}

TEST_F(Terminal, EverySecretHasItsPrompt) {
  struct Case {
    Arguments arguments;
    std::string prompt;
  };
  const std::vector<Case> cases{
      {{"code", "redeem"}, "Code: "},
      {{"code", "show", "--code-file", "-"}, "Code: "},
      {{"token", "refresh"}, "Refresh token: "},
      {{"token", "show", "--refresh-token-file", "-"}, "Refresh token: "},
      {{"token", "show", "--token-file", "-"}, "Access token: "},
      {{"client", "add", "--redirect-uri", "app:/x", "--scope", "x", "--name", "y", "--secret-file",
        "-"},
       "Client secret: "},
  };
  for (const Case& asked : cases) {
    const Outcome outcome = runOnTerminal(asked.arguments, {{asked.prompt, "hidden\n"}});
    EXPECT_THAT(outcome.out, StartsWith(asked.prompt + "\nkeldoauth: "));
    EXPECT_THAT(outcome.out, Not(HasSubstr("hidden")));
  }
}

TEST_F(Terminal, ATypedTokenAndItsConfirmation) {
  const std::string token = issueToken()["access_token"].asString();
  const Outcome revoked = runOnTerminal({"token", "revoke", "--token-file", "-"},
                                        {{"Access token: ", token + "\n"}, {"[y/N] ", "y\n"}});
  EXPECT_THAT(revoked, ExitsWith(kOk));
  EXPECT_EQ(rowCount("oauth_token"), "0");
}

// Secrets from files ----------------------------------------------------------------

TEST_F(Terminal, AMissingFile) {
  const Outcome outcome = addWithSecret("/tmp/missing");
  EXPECT_THAT(outcome, ExitsWith(kUsage));
  EXPECT_EQ(outcome.err,
            "keldoauth: client add: cannot read /tmp/missing: No such file or directory\n");
}

TEST_F(Terminal, AFolder) {
  const Outcome outcome = addWithSecret("/tmp");
  EXPECT_THAT(outcome, ExitsWith(kUsage));
  EXPECT_THAT(outcome.err, HasSubstr("cannot read /tmp: Is a directory\n"));
}

TEST_F(Terminal, NameOfAMissingFileIsShownWithoutControlCharacters) {
  const Outcome outcome = run({"token", "refresh", "--refresh-token-file", "/tmp/\033[2J"});
  EXPECT_THAT(outcome, ExitsWith(kUsage));
  EXPECT_THAT(outcome.err, HasSubstr("cannot read /tmp/\\x1b[2J: No such file or directory\n"));
}

TEST_F(Terminal, AFileThatHoldsMoreThanOneLine) {
  const std::string secret = support::id64('s');
  const std::string withNul = secret.substr(0, 63) + std::string(1, '\0');
  for (const std::string& content : {secret + "\n\n", "# my secret\n" + secret, withNul,
                                     std::string(5000, 's'), secret.substr(0, 63) + "\t"}) {
    const Outcome outcome = addWithSecret("-", content);
    EXPECT_THAT(outcome, ExitsWith(kUsage));
    EXPECT_EQ(outcome.err,
              "keldoauth: client add: Client secret: standard input does not hold one line of "
              "text\n");
  }
  EXPECT_EQ(rowCount("oauth_clientInfo"), "1");
}

TEST_F(Terminal, AnEndlessFile) {
  EXPECT_THAT(addWithSecret("/dev/zero"), ExitsWith(kUsage));
}

TEST_F(Terminal, APipe) {
  ASSERT_EQ(::mkfifo("/tmp/pipe", 0600), 0);
  std::thread writer([] { writeFile("/tmp/pipe", support::id64('s') + "\n"); });
  EXPECT_THAT(addWithSecret("/tmp/pipe"), ExitsWith(kOk));
  writer.join();
}

TEST_F(Terminal, AnUnreadableFileTouchesNothing) {
  sql("DELETE FROM oauth_clientInfo");
  addWithSecret("/tmp/missing");
  EXPECT_EQ(rowCount("oauth_clientInfo"), "0");
}

}  // namespace
}  // namespace cli
