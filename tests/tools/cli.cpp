#include "tests/tools/cli.h"

#include <fcntl.h>
#include <grp.h>
#include <json/reader.h>
#include <poll.h>
#include <pty.h>
#include <sys/mount.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <sstream>

#include "core/oauth_db_basic.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_token.h"

namespace cli {
namespace {

namespace fs = std::filesystem;

constexpr char kInput[] = "/tmp/cli.in";
constexpr char kOutput[] = "/tmp/cli.out";
constexpr char kErrors[] = "/tmp/cli.err";

[[noreturn]] void execute(Arguments words) {
  std::vector<char*> argv;
  for (std::string& word : words) argv.push_back(word.data());
  argv.push_back(nullptr);
  execv(argv.front(), argv.data());
  _exit(127);
}

int exitOf(pid_t child) {
  int status = 0;
  waitpid(child, &status, 0);
  return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
}

void redirect(int descriptor, const char* path, int flags) {
  const int opened = open(path, flags, 0600);
  if (opened < 0 || dup2(opened, descriptor) < 0) _exit(126);
}

int spawn(const Arguments& words, const char* output, const std::function<void()>& prepare = {}) {
  const pid_t child = fork();
  if (child != 0) return exitOf(child);

  redirect(STDIN_FILENO, kInput, O_RDONLY);
  redirect(STDOUT_FILENO, output, O_WRONLY | O_CREAT | O_TRUNC);
  redirect(STDERR_FILENO, kErrors, O_WRONLY | O_CREAT | O_TRUNC);
  if (prepare) prepare();
  execute(words);
}

/// The program and its libraries where another user may read them: the
/// checkout may lie in a folder that is closed to others.
std::string publicCopy() {
  const fs::path program(KELDOAUTH_CLI);
  const fs::path folder("/tmp/program");
  fs::create_directory(folder);
  fs::permissions(folder, fs::perms(0755));
  for (const auto& entry : fs::directory_iterator(program.parent_path())) {
    const std::string name = entry.path().filename();
    if (name != program.filename() && name.find(".so") == std::string::npos) continue;
    fs::copy(entry.path(), folder / name, fs::copy_options::overwrite_existing);
  }
  return folder / program.filename();
}

void mountOver(const char* target, const char* type, unsigned long flags) {
  ASSERT_EQ(mount(type, target, type, flags, nullptr), 0) << std::strerror(errno);
}

std::string withoutCarriageReturns(std::string text) {
  text.erase(std::remove(text.begin(), text.end(), '\r'), text.end());
  return text;
}

/// False when nothing comes for much longer than any command takes.
bool waitForOutput(int terminal) {
  constexpr int kPatienceMilliseconds = 30000;
  pollfd polled{terminal, POLLIN, 0};
  return poll(&polled, 1, kPatienceMilliseconds) > 0;
}

/// Reads to the end, and answers each prompt once it is there.
std::string converse(int terminal, const std::vector<Typed>& typed) {
  std::string shown;
  std::size_t seen = 0;
  auto next = typed.begin();
  std::array<char, 1024> buffer{};
  while (waitForOutput(terminal)) {
    const ssize_t got = read(terminal, buffer.data(), buffer.size());
    if (got <= 0) break;
    shown.append(buffer.data(), static_cast<std::size_t>(got));
    if (next == typed.end() || shown.find(next->prompt, seen) == std::string::npos) continue;
    seen = shown.size();
    if (next->meanwhile) next->meanwhile();
    EXPECT_EQ(write(terminal, next->text.data(), next->text.size()),
              static_cast<ssize_t>(next->text.size()));
    ++next;
  }
  EXPECT_EQ(next, typed.end()) << "not asked: " << next->prompt;
  return withoutCarriageReturns(shown);
}

}  // namespace

Arguments commandLine(const std::string& program, const Arguments& arguments) {
  Arguments words;
  std::istringstream emulator(KELDOAUTH_EMULATOR);
  for (std::string word; std::getline(emulator, word, ';');) words.push_back(word);
  words.push_back(program);
  words.insert(words.end(), arguments.begin(), arguments.end());
  return words;
}

void CliTest::SetUp() {
  World::SetUp();
  ::unsetenv("COLUMNS");
  ::setenv("SUDO_USER", "carol", 1);
}

Outcome CliTest::run(const Arguments& arguments, const std::string& input) {
  writeFile(kInput, input);
  return collect(spawn(commandLine(KELDOAUTH_CLI, arguments), kOutput));
}

Outcome CliTest::runProgram(const Arguments& words) {
  writeFile(kInput, "");
  return collect(spawn(words, kOutput));
}

Outcome CliTest::runEightTimes(const Arguments& arguments, const std::string& input) {
  static constexpr char kScript[] =
      "input=$1; shift; for i in 1 2 3 4 5 6 7 8; do \"$@\" <<<\"$input\" & done; wait";
  Arguments words{"/bin/bash", "-c", kScript, "bash", input};
  const Arguments command = commandLine(KELDOAUTH_CLI, arguments);
  words.insert(words.end(), command.begin(), command.end());
  return runProgram(words);
}

Outcome CliTest::runAsNobody(const Arguments& arguments) {
  Arguments words = commandLine(KELDOAUTH_CLI, arguments);
  *std::find(words.begin(), words.end(), KELDOAUTH_CLI) = publicCopy();
  writeFile(kInput, "");
  return collect(spawn(words, kOutput, [] {
    if (setgroups(0, nullptr) != 0 || setresgid(kNobody, kNobody, kNobody) != 0 ||
        setresuid(kNobody, kNobody, kNobody) != 0) {
      _exit(125);
    }
  }));
}

Outcome CliTest::runInto(const std::string& path, const Arguments& arguments) {
  writeFile(kInput, "");
  return collect(spawn(commandLine(KELDOAUTH_CLI, arguments), path.c_str()));
}

Outcome CliTest::collect(int exit) {
  return {exit, readFile(kOutput), readFile(kErrors)};
}

Outcome CliTest::runOnTerminal(const Arguments& arguments, const std::vector<Typed>& typed,
                               unsigned short columns) {
  const Arguments words = commandLine(KELDOAUTH_CLI, arguments);
  const winsize size{24, columns, 0, 0};
  int terminal = -1;
  const pid_t child = forkpty(&terminal, nullptr, nullptr, &size);
  if (child == 0) execute(words);

  Outcome outcome;
  outcome.out = converse(terminal, typed);
  close(terminal);  // hangs up on a program that still waits
  outcome.exit = exitOf(child);
  return outcome;
}

Json::Value CliTest::json(Arguments arguments, const std::string& input, int exit) {
  arguments.emplace_back("--json");
  const Outcome outcome = run(arguments, input);
  EXPECT_EQ(outcome.exit, exit) << outcome.out << outcome.err;
  EXPECT_EQ(lines(outcome.out).size(), 1U) << outcome.out;

  Json::CharReaderBuilder builder;
  Json::CharReaderBuilder::strictMode(&builder.settings_);
  Json::Value document;
  std::string errors;
  const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  const char* const begin = outcome.out.data();
  EXPECT_TRUE(reader->parse(begin, begin + outcome.out.size(), &document, &errors))
      << errors << outcome.out;
  return document;
}

void CliTest::makeStore() {
  const KELDOAUTHSERVER::OAUTHDBBasic store;
}

Json::Value CliTest::addClient(const std::string& name) {
  return json({"client", "add", "--redirect-uri", "https://frame.example.org/back", "--scope",
               "profile photos", "--name", name})["client"];
}

Json::Value CliTest::issueCode(const Arguments& more) {
  Arguments arguments{"code",  "issue",   "--client", "1",       "--username",
                      "alice", "--scope", "photos",   "--state", "state1"};
  arguments.insert(arguments.end(), more.begin(), more.end());
  return json(arguments)["code"];
}

Json::Value CliTest::issueToken(const Arguments& more) {
  Arguments arguments{"token", "issue",   "--client", "1",       "--username",
                      "alice", "--scope", "photos",   "--state", "state1"};
  arguments.insert(arguments.end(), more.begin(), more.end());
  return json(arguments)["token"];
}

std::string CliTest::storeForeignCode(const std::string& username, const std::string& scope) {
  KELDOAUTHSERVER::OAUTHDBGrantCode codes("oauth_grantCode");
  Json::Value code;
  codes.Add(username, json({"client", "show", "1"})["client"]["client_id"].asString(), scope,
            "state1", "192.0.2.1", code);
  return code["code"].asString();
}

Json::Value CliTest::storeForeignToken(const std::string& username, const std::string& scope) {
  KELDOAUTHSERVER::OAUTHDBToken tokens("oauth_token");
  Json::Value pair;
  tokens.Add(username, json({"client", "show", "1"})["client"]["client_id"].asString(), scope,
             "implicit", "state1", "192.0.2.1", pair);
  return pair;
}

void CliTest::multiply(const std::string& table, int rows) {
  const std::string columns = table == "oauth_grantCode"
                                  ? "code || i, expired_time"
                                  : "refresh_token, access_token || i, expired_time, flow_type";
  sql("WITH RECURSIVE n(i) AS (SELECT 2 UNION ALL SELECT i+1 FROM n WHERE i<" +
      std::to_string(rows) + ") INSERT INTO " + table + " SELECT username, client_id, scope, " +
      columns + ", state, ip, i FROM " + table + ", n WHERE id=1");
}

void CliTest::expireIn(const std::string& table, int id, long long seconds) {
  sql("UPDATE " + table + " SET expired_time='" +
      std::to_string(static_cast<long long>(::time(nullptr)) + seconds) +
      "' WHERE id=" + std::to_string(id));
}

std::string CliTest::rowCount(const std::string& table) {
  return sqlText("SELECT count(*) FROM " + table);
}

bool canBecomeNobody() {
  std::ifstream map("/proc/self/uid_map");
  unsigned long first = 0;
  unsigned long outside = 0;
  unsigned long count = 0;
  return static_cast<bool>(map >> first >> outside >> count) && first + count > kNobody;
}

HiddenFolder::HiddenFolder() {
  mountOver("/var/packages/Corvane/target", "tmpfs", 0);
}
HiddenFolder::~HiddenFolder() {
  umount2("/var/packages/Corvane/target", MNT_DETACH);
}

ReadOnlyFolder::ReadOnlyFolder() {
  mountOver("/var/packages/Corvane/target/etc", nullptr, MS_REMOUNT | MS_BIND | MS_RDONLY);
}
ReadOnlyFolder::~ReadOnlyFolder() {
  mountOver("/var/packages/Corvane/target/etc", nullptr, MS_REMOUNT | MS_BIND);
}

std::vector<std::string> lines(const std::string& text) {
  std::istringstream stream(text);
  std::vector<std::string> found;
  for (std::string line; std::getline(stream, line);) found.push_back(line);
  return found;
}

}  // namespace cli
