#include "tests/operations/operations_test.h"

#include <sqlite3.h>
#include <sys/stat.h>

#include <algorithm>
#include <cstdlib>
#include <ctime>
#include <filesystem>

#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "utils/oauth_names.h"

namespace operations {
namespace {

namespace fs = std::filesystem;
namespace names = KELDOAUTHSERVER::names;

constexpr const char* kTables[] = {names::kMetaTable, names::kClientInfoTable,
                                   names::kGrantCodeTable, names::kTokenTable, names::kLogTable};

/// A variable of the environment for the programs that are started meanwhile.
class Variable {
 public:
  Variable(const char* name, const std::string& value) : name_(name) {
    ::setenv(name, value.c_str(), 1);
  }
  ~Variable() { ::unsetenv(name_); }
  Variable(const Variable&) = delete;
  Variable& operator=(const Variable&) = delete;

 private:
  const char* name_;
};

Arguments victim(const Arguments& arguments) {
  return cli::commandLine(KELDOAUTH_VICTIM, arguments);
}

int collectRow(void* rows, int count, char** values, char** columns) {
  support::Row row;
  for (int i = 0; i < count; ++i) row[columns[i]] = values[i] != nullptr ? values[i] : "<NULL>";
  static_cast<std::vector<support::Row>*>(rows)->push_back(row);
  return 0;
}

/// In short even steps, to get a turn between busy writers.
int waitForLock(void* /*unused*/, int waits) {
  constexpr int kMost = 30000;
  constexpr timespec kStep{0, 1000000};
  nanosleep(&kStep, nullptr);
  return waits < kMost ? 1 : 0;
}

class Connection {
 public:
  explicit Connection(const std::string& path) {
    EXPECT_EQ(sqlite3_open_v2(path.c_str(), &db_, SQLITE_OPEN_READWRITE, nullptr), SQLITE_OK);
    sqlite3_busy_handler(db_, waitForLock, nullptr);
  }
  ~Connection() { sqlite3_close(db_); }
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;

  std::vector<support::Row> rows(const std::string& sql) const {
    std::vector<support::Row> found;
    EXPECT_EQ(sqlite3_exec(db_, sql.c_str(), collectRow, &found, nullptr), SQLITE_OK)
        << sql << ": " << sqlite3_errmsg(db_);
    return found;
  }

 private:
  sqlite3* db_ = nullptr;
};

}  // namespace

void Operations::SetUp() {
  CliTest::SetUp();
  umask_ = ::umask(0);
  fs::create_directory(kCopies);
}

void Operations::TearDown() {
  ::umask(umask_);
  CliTest::TearDown();
}

void Operations::furnish(const std::string& name) {
  Json::Value out;
  KELDOAUTHSERVER::OAUTHDBClientInfo clients(names::kClientInfoTable);
  KELDOAUTHSERVER::OAUTHDBGrantCode codes(names::kGrantCodeTable);
  KELDOAUTHSERVER::OAUTHDBToken tokens(names::kTokenTable);
  for (int i = 0; i < 3; ++i) {
    ASSERT_TRUE(clients.Add("app:/" + name, "read", name + std::to_string(i), out));
    const std::string id = out[names::kClientId].asString();
    ASSERT_TRUE(codes.Add(name, id, "read", "state", "192.0.2.1", out));
    ASSERT_TRUE(tokens.Add(name, id, "read", "implicit", "state", "192.0.2.1", out));
  }
}

Outcome Operations::backUp(const std::string& path) {
  return run({"backup", path});
}

Outcome Operations::restore(const std::string& path) {
  return run({"restore", "--yes", path});
}

Outcome Operations::dieAt(int nth, Death death, const Arguments& arguments) {
  const Variable at("KELDOAUTH_DIE_AT", std::to_string(nth));
  const Variable torn("KELDOAUTH_DIE_TORN", death == Death::kWithinTheStep ? "1" : "0");
  return runProgram(victim(arguments));
}

std::vector<Operations::Death> Operations::deathsAt(int step) {
  const bool isEmulated = *KELDOAUTH_EMULATOR != '\0';
  if (!isEmulated) return {Death::kBeforeTheStep, Death::kWithinTheStep};
  return {step % 2 == 0 ? Death::kBeforeTheStep : Death::kWithinTheStep};
}

Outcome Operations::meanwhile(int nth, const std::string& line, const Arguments& arguments) {
  const Variable at("KELDOAUTH_DIE_AT", std::to_string(nth));
  const Variable action("KELDOAUTH_MEANWHILE", line);
  return runProgram(victim(arguments));
}

Outcome Operations::failAt(int nth, Failing how, const Arguments& arguments) {
  const Variable at("KELDOAUTH_DIE_AT", std::to_string(nth));
  const Variable failure("KELDOAUTH_FAIL", how == Failing::kDone ? "done" : "undone");
  const Variable hurried("KELDOAUTH_HURRY", "1");
  return runProgram(victim(arguments));
}

Outcome Operations::withoutFolderSync(const Arguments& arguments) {
  const Variable failing("KELDOAUTH_NO_FOLDER_SYNC", "1");
  return runProgram(victim(arguments));
}

Outcome Operations::hurry(const Arguments& arguments) {
  const Variable hurried("KELDOAUTH_HURRY", "1");
  return runProgram(victim(arguments));
}

std::vector<std::string> Operations::stepsOf(const Arguments& arguments) {
  static constexpr char kRecord[] = "/tmp/steps";
  fs::remove(kRecord);
  const Variable record("KELDOAUTH_STEPS", kRecord);
  const Outcome outcome = runProgram(victim(arguments));
  EXPECT_THAT(outcome, ExitsWith(cli::kOk));
  return cli::lines(readFile(kRecord));
}

namespace {

/// What restore and rekey leave in the audit log is no part of what they carry.
void dropOwnEntries(std::vector<support::Row>& log) {
  const auto isOwn = [](const support::Row& entry) {
    const std::string& text = entry.at("msg");
    return text == "Database restored by [carol]" || text == "Key changed by [carol]";
  };
  log.erase(std::remove_if(log.begin(), log.end(), isOwn), log.end());
}

}  // namespace

Content Operations::contentOf(const std::string& path) {
  const Connection connection(path);
  connection.rows("BEGIN");  // all as of one moment
  const std::vector<support::Row> verdict = connection.rows("PRAGMA integrity_check");
  EXPECT_EQ(verdict, (std::vector<support::Row>{{{"integrity_check", "ok"}}}));
  Content content;
  for (const char* table : kTables) {
    content[table] = connection.rows(std::string("SELECT * FROM ") + table);
  }
  dropOwnEntries(content["oauth_log"]);
  return content;
}

void Operations::execute(const std::string& path, const std::string& sql) {
  Connection(path).rows(sql);
}

std::string Operations::valueIn(const std::string& path, const std::string& sql) {
  const std::vector<support::Row> rows = Connection(path).rows(sql);
  return rows.empty() ? "" : rows.front().begin()->second;
}

Content Operations::crashWhileWriting() {
  const Arguments command{"log", "add", "entry"};
  const std::vector<std::string> steps = stepsOf(command);
  const auto last = std::find(steps.rbegin(), steps.rend(), std::string("write ") + kDatabase);
  Content content = contentOf();
  dieAt(static_cast<int>(steps.rend() - last), Death::kWithinTheStep, command);
  EXPECT_GT(readFile(kJournal).size(), 0U);
  return content;
}

std::map<std::string, std::string> Operations::filesIn(const std::string& folder) {
  std::map<std::string, std::string> files;
  for (const auto& entry : fs::directory_iterator(folder)) {
    files[entry.path().filename()] = readFile(entry.path());
  }
  return files;
}

void Operations::putBack(const std::string& folder,
                         const std::map<std::string, std::string>& files) {
  for (const auto& entry : fs::directory_iterator(folder)) fs::remove(entry.path());
  for (const auto& [name, bytes] : files) {
    const std::string path = folder + "/" + name;
    writeFile(path, bytes);
    ::chmod(path.c_str(), 0600);
  }
}

void Operations::expectPrivate(const std::string& folder) {
  for (const auto& entry : fs::directory_iterator(folder)) {
    const fs::file_status status = entry.status();
    const bool isGone = status.type() == fs::file_type::not_found;
    if (isGone || entry.path() == kSettings) continue;
    EXPECT_EQ(status.permissions(), fs::perms(0600)) << entry.path();
  }
}

void Operations::expectNextProgramReady() {
  KELDOAUTHSERVER::OAUTHDBLog log(names::kLogTable);
  Json::Value count;
  EXPECT_NE(log.DBGetRowCount(count), 0);
  EXPECT_EQ(log.GetErrCode(), 255);
}

}  // namespace operations
