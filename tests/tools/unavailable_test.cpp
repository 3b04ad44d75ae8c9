// Commands on a database that does not work.

#include <sqlite3.h>
#include <sys/stat.h>

#include <chrono>

#include "tests/tools/cli.h"

namespace cli {
namespace {

using testing::HasSubstr;

class Unavailable : public CliTest {
 protected:
  void SetUp() override {
    CliTest::SetUp();
    ::chmod(kStateDir, 0700);
  }

  static Arguments addArguments() {
    return {"client", "add", "--redirect-uri", "app:/back", "--scope", "x", "--name", "y"};
  }
};

/// A connection that keeps every other one from writing.
class WriteLock {
 public:
  explicit WriteLock(const char* path) {
    sqlite3_open(path, &db_);
    EXPECT_EQ(sqlite3_exec(db_, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr), SQLITE_OK);
  }
  ~WriteLock() { sqlite3_close(db_); }
  WriteLock(const WriteLock&) = delete;
  WriteLock& operator=(const WriteLock&) = delete;

 private:
  sqlite3* db_ = nullptr;
};

TEST_F(Unavailable, AMissingFolder) {
  const HiddenFolder hidden;
  for (const Arguments& command :
       {Arguments{"client", "list"}, Arguments{"code", "list"}, Arguments{"token", "list"},
        Arguments{"log", "list"}, addArguments()}) {
    const Outcome outcome = run(command);
    EXPECT_THAT(outcome, ExitsWith(kUnavailable));
    EXPECT_THAT(outcome.err, HasSubstr(": Open DB failed!! (14)\nhint: 'keldoauth status' "));
  }
}

TEST_F(Unavailable, ADamagedDatabase) {
  writeFile(kDatabase, std::string(4096, 'x'));
  const Outcome outcome = run({"client", "list"});
  EXPECT_THAT(outcome, ExitsWith(kUnavailable));
  EXPECT_EQ(outcome.err,
            "keldoauth: client list: file is not a database (26)\n"
            "hint: the database file is damaged; put back a copy or move the file away\n");
}

TEST_F(Unavailable, ADamagedPage) {
  addClient();
  issueCode();
  multiply("oauth_grantCode", 40);
  std::string file = readFile(kDatabase);
  for (std::size_t page = 6; page * 4096 < file.size(); ++page)
    file.replace(page * 4096, 8, 8, 'x');
  writeFile(kDatabase, file);
  const Outcome outcome = run({"code", "list"});
  EXPECT_THAT(outcome, ExitsWith(kUnavailable));
  EXPECT_THAT(outcome.err, HasSubstr("code list: database disk image is malformed (11)\n"));
}

TEST_F(Unavailable, AFolderThatCannotBeWritten) {
  addClient();
  const ReadOnlyFolder readOnly;
  EXPECT_THAT(run({"client", "list"}), ExitsWith(kOk));
  const Outcome outcome = run({"client", "disable", "1"});
  EXPECT_THAT(outcome, ExitsWith(kUnavailable));
  EXPECT_THAT(outcome.err, HasSubstr("attempt to write a readonly database (8)\n"));
}

TEST_F(Unavailable, AnotherUser) {
  if (!canBecomeNobody()) GTEST_SKIP() << "no other user in this namespace";
  addClient();
  const Outcome outcome = runAsNobody({"client", "list"});
  EXPECT_THAT(outcome, ExitsWith(kUnavailable));
  EXPECT_THAT(outcome.err, HasSubstr("client list: Open DB failed!! (14)\n"));
}

TEST_F(Unavailable, ALockedDatabase) {
  addClient();
  const WriteLock lock(kDatabase);
  const auto start = std::chrono::steady_clock::now();
  const Outcome outcome = run({"client", "disable", "1"});
  EXPECT_THAT(outcome, ExitsWith(kUnavailable));
  EXPECT_EQ(outcome.err,
            "keldoauth: client disable: database is locked (5)\n"
            "hint: another process holds the database; try again\n");
  EXPECT_GE(std::chrono::steady_clock::now() - start, std::chrono::seconds(4));
}

TEST_F(Unavailable, AFullTableThatCannotBeCountedIsNotFull) {
  addClient();
  sql("DROP TABLE oauth_grantCode; CREATE VIEW oauth_grantCode AS SELECT * FROM missing");
  const Outcome outcome = run({"code", "issue", "--client", "1", "--username", "alice", "--scope",
                               "photos", "--state", "s"});
  EXPECT_THAT(outcome, ExitsWith(kUnavailable));
  EXPECT_THAT(outcome.err, HasSubstr("no such table: main.missing (1)"));
}

TEST_F(Unavailable, ACipherThatFails) {
  addClient();
  ::chmod("/var/packages/Corvane/target/etc/keldcore.key", 0644);
  const Outcome outcome = run(addArguments());
  EXPECT_THAT(outcome, ExitsWith(kUnavailable));
  EXPECT_EQ(outcome.err,
            "keldoauth: client add: Data Decrypt failed (-4)\n"
            "hint: the platform's cipher or its key cannot be used; the system log says more\n");
}

}  // namespace
}  // namespace cli
