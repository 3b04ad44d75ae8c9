// Help, mistakes on the command line, and whether manual page and completion
// still say what the program does.

#include <algorithm>
#include <filesystem>
#include <regex>

#include "tests/tools/cli.h"

namespace cli {
namespace {

using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using testing::StartsWith;

struct Command {
  std::string group;  // empty for a command without one
  std::string name;
};

const std::vector<Command>& allCommands() {
  static const std::vector<Command> commands{{"client", "add"},
                                             {"client", "list"},
                                             {"client", "show"},
                                             {"client", "edit"},
                                             {"client", "renew-secret"},
                                             {"client", "enable"},
                                             {"client", "disable"},
                                             {"client", "revoke"},
                                             {"client", "remove"},
                                             {"user", "list"},
                                             {"user", "show"},
                                             {"user", "revoke"},
                                             {"code", "issue"},
                                             {"code", "list"},
                                             {"code", "show"},
                                             {"code", "edit"},
                                             {"code", "redeem"},
                                             {"code", "revoke"},
                                             {"code", "remove"},
                                             {"code", "purge"},
                                             {"token", "issue"},
                                             {"token", "list"},
                                             {"token", "show"},
                                             {"token", "verify"},
                                             {"token", "edit"},
                                             {"token", "refresh"},
                                             {"token", "revoke"},
                                             {"token", "purge"},
                                             {"log", "list"},
                                             {"log", "add"},
                                             {"log", "clear"},
                                             {"engine", "show"},
                                             {"engine", "set"},
                                             {"", "purge"},
                                             {"", "status"},
                                             {"", "backup"},
                                             {"", "restore"},
                                             {"", "rekey"}};
  return commands;
}

Arguments words(const Command& command) {
  return command.group.empty() ? Arguments{command.name} : Arguments{command.group, command.name};
}

class Usage : public CliTest {
 protected:
  static std::string help(Arguments arguments) {
    arguments.emplace_back("--help");
    const Outcome outcome = run(arguments);
    EXPECT_THAT(outcome, ExitsWith(kOk));
    EXPECT_EQ(outcome.err, "");
    return outcome.out;
  }

  /// The long options that a command's help lists.
  static std::vector<std::string> optionsOf(const Command& command) {
    const std::string text = help(words(command));
    const std::regex option("\n  (?:-[a-z],)?(--[a-z-]+)");
    std::vector<std::string> options;
    for (std::sregex_iterator it(text.begin(), text.end(), option), end; it != end; ++it) {
      options.push_back((*it)[1]);
    }
    return options;
  }

  /// What completion offers at the end of "keldoauth <line>", sorted.
  static std::vector<std::string> complete(const std::string& line) {
    static constexpr char kScript[] = R"(
      source "$1"
      compopt() { :; }
      read -ra COMP_WORDS <<<"keldoauth $2"
      if [[ $2 == *' ' ]]; then COMP_WORDS+=(''); fi
      COMP_CWORD=$((${#COMP_WORDS[@]} - 1))
      _keldoauth
      for word in "${COMPREPLY[@]}"; do echo "$word"; done)";
    const Outcome offered =
        runProgram({"/bin/bash", "-c", kScript, "bash",
                    std::string(KELDOAUTH_CLI_SOURCES) + "/keldoauth.bash-completion", line});
    EXPECT_EQ(offered.err, "");
    std::vector<std::string> words = lines(offered.out);
    std::sort(words.begin(), words.end());
    return words;
  }

  static std::string source(const std::string& name) {
    return readFile(std::string(KELDOAUTH_CLI_SOURCES) + "/" + name);
  }
};

TEST_F(Usage, HelpListsEveryCommand) {
  EXPECT_THAT(help({}), HasSubstr("status "));
  for (const Command& command : allCommands()) {
    if (command.group.empty()) continue;
    EXPECT_THAT(help({}), HasSubstr("\n  " + command.group + " "));
    EXPECT_THAT(help({command.group}), HasSubstr("\n  " + command.name + " "));
  }
}

TEST_F(Usage, HelpOfEveryCommand) {
  for (const Command& command : allCommands()) {
    const std::string text = help(words(command));
    EXPECT_THAT(text, HasSubstr("Usage: keldoauth "));
    EXPECT_THAT(text, HasSubstr("--json"));
  }
}

TEST_F(Usage, HelpMarksWhatIsRequired) {
  const std::string text = help({"client", "add"});
  EXPECT_THAT(text, HasSubstr("--scope TEXT (required) "));
  EXPECT_THAT(text, HasSubstr("--secret-file FILE "));
}

TEST_F(Usage, HelpDoesNotTouchTheDatabase) {
  help({"client", "list"});
  EXPECT_FALSE(std::filesystem::exists(kDatabase));
}

TEST_F(Usage, Version) {
  const Outcome outcome = run({"--version"});
  EXPECT_THAT(outcome, ExitsWith(kOk));
  EXPECT_THAT(outcome.out, testing::MatchesRegex("keldoauth [0-9]+\\.[0-9]+\\.[0-9]+\n"));
}

TEST_F(Usage, MistakesGoToStandardErrorWithAHint) {
  struct Case {
    Arguments arguments;
    std::string message;
  };
  const std::vector<Case> cases{
      {{}, "keldoauth: a command is missing\nhint: 'keldoauth --help'"},
      {{"client"}, "keldoauth: client: a command is missing\nhint: 'keldoauth client --help'"},
      {{"clients"}, "keldoauth: unknown command 'clients'\n"},
      {{"client", "delete"}, "keldoauth: client: unknown command 'delete'\n"},
      {{"client", "list", "--secret"}, "keldoauth: client list: unexpected argument '--secret'\n"},
      {{"client", "list", "x\n"}, "keldoauth: client list: unexpected argument 'x\\n'\n"},
      {{"client", "show"}, "keldoauth: client show: CLIENT is required\n"},
      {{"client", "add"}, "keldoauth: client add: --scope is required\n"},
      {{"token", "purge", "--grace", "1.5"},
       "keldoauth: token purge: --grace: '1.5' is not a whole number\n"},
      {{"token", "purge", "--grace", "99999999999"},
       "keldoauth: token purge: --grace: 99999999999 is above 3155760000\n"},
      {{"token", "purge", "--grace"}, "keldoauth: token purge: --grace"},
      {{"code", "edit", "x", "--scope", "y"},
       "keldoauth: code edit: ID: 'x' is not a whole number\n"},
      {{"code", "revoke", "1\033[2J"},
       "keldoauth: code revoke: ID: '1\\x1b[2J' is not a whole number\n"},
  };
  for (const Case& mistake : cases) {
    const Outcome outcome = run(mistake.arguments);
    EXPECT_THAT(outcome, ExitsWith(kUsage));
    EXPECT_THAT(outcome.err, StartsWith(mistake.message));
    EXPECT_THAT(outcome.err, HasSubstr("hint: 'keldoauth "));
    EXPECT_EQ(outcome.out, "");
  }
}

TEST_F(Usage, MistakesDoNotTouchTheDatabase) {
  run({"client", "add", "--name", "x"});
  EXPECT_FALSE(std::filesystem::exists(kDatabase));
}

TEST_F(Usage, AMistakeWithJsonIsADocument) {
  makeStore();
  for (const Arguments& mistake :
       {Arguments{}, Arguments{"client"}, Arguments{"log", "add"}, Arguments{"code", "show"}}) {
    const Json::Value error = json(mistake, "", kUsage)["error"];
    EXPECT_EQ(error["exit"], Json::Value(kUsage));
    EXPECT_EQ(error["code"], Json::Value());
    EXPECT_THAT(error["message"].asString(), Not(IsEmpty()));
  }
}

TEST_F(Usage, JsonIsTakenBeforeTheCommandToo) {
  makeStore();
  for (const Arguments& command :
       {Arguments{"--json", "client", "list"}, Arguments{"client", "--json", "list"},
        Arguments{"client", "list", "--json"}, Arguments{"--json", "client", "list", "--json"}}) {
    EXPECT_EQ(run(command).out, "{\"clients\":[]}\n");
  }
}

TEST_F(Usage, AFailureWithJsonIsADocumentAndALine) {
  makeStore();
  const Outcome outcome = run({"client", "show", "3", "--json"});
  EXPECT_EQ(outcome.out,
            R"({"error":{"code":null,"exit":3,"hint":"","message":"no such client 3"}})"
            "\n");
  EXPECT_EQ(outcome.err, "keldoauth: client show: no such client 3\n");
}

TEST_F(Usage, ARefusalWithJsonHasTheLibrarysCode) {
  makeStore();
  const Json::Value error = json(
      {"client", "add", "--no-redirect-uri", "--name", "x", "--scope", ""}, "", kRefused)["error"];
  EXPECT_EQ(error["code"], Json::Value(-2));
  EXPECT_EQ(error["exit"], Json::Value(kRefused));
  EXPECT_EQ(error["message"], "a value is too short or too long");
  EXPECT_EQ(error["hint"], "--scope: 1 to 2048 bytes, not 0");
}

TEST_F(Usage, AnAnswerThatCannotBeWritten) {
  makeStore();
  const Outcome outcome = runInto("/dev/full", {"client", "list"});
  EXPECT_THAT(outcome, ExitsWith(kNotWritten));
  EXPECT_EQ(outcome.err, "keldoauth: cannot write to standard output\n");
}

TEST_F(Usage, SecretsAreNoArguments) {
  for (const Command& command : allCommands()) {
    const std::vector<std::string> options = optionsOf(command);
    for (const char* forbidden : {"--secret", "--code", "--token", "--refresh-token"}) {
      EXPECT_EQ(std::count(options.begin(), options.end(), forbidden), 0) << forbidden;
    }
  }
}

TEST_F(Usage, TheManualPageHasEveryCommandAndOption) {
  const std::string page = source("keldoauth.8");
  for (const Command& command : allCommands()) {
    const std::string name = command.group + (command.group.empty() ? "" : " ") + command.name;
    const std::size_t start = page.find("Cm " + name, page.find(".Sh COMMANDS"));
    ASSERT_NE(start, std::string::npos) << name;
    const std::string entry = page.substr(start, page.find("\n.It", start + 1) - start);
    for (const std::string& option : optionsOf(command)) {
      if (option == "--help" || option == "--json") continue;
      EXPECT_THAT(entry, HasSubstr("Fl -" + option.substr(2))) << name;
    }
  }
}

TEST_F(Usage, CompletionOffersEveryCommandAndOption) {
  for (const Command& command : allCommands()) {
    std::vector<std::string> expected = optionsOf(command);
    std::sort(expected.begin(), expected.end());
    const std::string line =
        command.group.empty() ? command.name + " --" : command.group + " " + command.name + " --";
    EXPECT_EQ(complete(line), expected) << line;
    const std::string prefix = command.group.empty() ? "" : command.group + " ";
    EXPECT_THAT(complete(prefix + command.name), testing::Contains(command.name));
  }
}

TEST_F(Usage, CompletionOffersFilesWhereAFileIsMeant) {
  writeFile("/tmp/secret.txt", "");
  for (const char* before : {"client add --secret-file", "token verify --token-file", "backup"}) {
    EXPECT_THAT(complete(std::string(before) + " /tmp/sec"),
                testing::ElementsAre("/tmp/secret.txt"));
  }
}

TEST_F(Usage, CompletionDoesNotInventValues) {
  EXPECT_THAT(complete("client add --name "), IsEmpty());
}

}  // namespace
}  // namespace cli
