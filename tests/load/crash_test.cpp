// A writer is killed at a random moment, again and again on the same file. What
// it was told is done is done, what it was doing is done or not, and the next
// process finds the file in order.

#include <fcntl.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <fstream>
#include <thread>

#include "stores/oauth_log.h"
#include "tests/load/crash_model.h"
#include "tests/load/crash_writer.h"
#include "tests/load/processes.h"
#include "tests/support/long_form.h"
#include "utils/oauth_names.h"

namespace load {
namespace {

namespace names = KELDOAUTHSERVER::names;
using support::Row;

using Clock = std::chrono::steady_clock;
using std::chrono::microseconds;

/// A writer tells of so much at the most before its last moments begin.
constexpr unsigned kMostMessages = 8;

class CrashTest : public support::World {
 protected:
  void SetUp() override {
    umask_ = umask(0);  // what is private is so by the library's own doing
    startWithoutFile();
  }
  void TearDown() override {
    World::TearDown();
    umask(umask_);
  }

  void startWithoutFile() {
    World::SetUp();
    writeSettings("{\"log_max\": " + std::to_string(kLogMax) + "}");
    support::Clock::setTo(kNow);
    support::Platform::useReadableCipher();
    states_ = {State{}};
  }

  /// Starts a writer, kills it, and works out in which states the file may be.
  void crash();

  static bool isJournalHot();
  static void expectPrivateFiles();
  void expectNextProcessReady();
  /// The file is in one of the states, which is the only one from now on.
  void expectOneOfTheStates();

  int hotJournals_ = 0;
  int interrupted_ = 0;  // kills within an operation ...
  int completed_ = 0;    // ... the effect of which is there all the same
  std::vector<State> states_;

 private:
  static Message receive(int pipe, bool& open);
  void note(const Message& message);
  void watchSome(int pipe);
  void waitUpToTwoOperations();

  static constexpr char kJournal[] = "/var/packages/Corvane/target/etc/oauth.db-journal";

  mode_t umask_ = 0;
  int serial_ = 1;
  microseconds operationTakes_{10000};  // lately
  std::mt19937 random_{support::isLongForm() ? std::random_device()() : 1U};
};

Message CrashTest::receive(int pipe, bool& open) {
  Message message{};
  open = read(pipe, &message, sizeof message) == static_cast<ssize_t>(sizeof message);
  return message;
}

/// An operation that began may be anywhere between its first state and its last.
void CrashTest::note(const Message& message) {
  const std::vector<State> passed = statesAfter(states_.front(), message.operation);
  switch (message.news) {
    case News::kBegins:
      states_.insert(states_.end(), passed.begin(), passed.end());
      serial_ = std::max(serial_, message.operation.serial + 1);
      break;
    case News::kSucceeded:
      states_ = {passed.back()};
      break;
    case News::kFailed:
      ADD_FAILURE() << "operation " << static_cast<int>(message.operation.action) << " failed";
      break;
  }
}

/// Follows the writer for a while and learns how fast it is.
void CrashTest::watchSome(int pipe) {
  bool open = true;
  Clock::time_point before{};
  for (auto messages = random_() % kMostMessages; open && messages > 0; --messages) {
    const Message message = receive(pipe, open);
    if (!open) return;
    note(message);
    const Clock::time_point now = Clock::now();
    if (message.news == News::kSucceeded && before != Clock::time_point()) {
      const auto took = std::chrono::duration_cast<microseconds>(now - before);
      operationTakes_ = (3 * operationTakes_ + took) / 4;
    }
    before = now;
  }
}

/// So that every moment of an operation has its turn, however fast the disk is.
void CrashTest::waitUpToTwoOperations() {
  const auto limit = static_cast<unsigned long>(2 * operationTakes_.count() + 1);
  std::this_thread::sleep_for(microseconds(random_() % limit));
}

void CrashTest::crash() {
  int pipe[2];
  ASSERT_EQ(pipe2(pipe, O_CLOEXEC), 0);
  const auto seed = static_cast<unsigned>(random_());
  const pid_t writer = startProcess([&] { writeForEver(pipe[1], states_.front(), serial_, seed); });
  close(pipe[1]);
  watchSome(pipe[0]);
  waitUpToTwoOperations();
  kill(writer, SIGKILL);
  int status = 0;
  waitpid(writer, &status, 0);
  EXPECT_TRUE(WIFSIGNALED(status)) << "the writer ended by itself";

  bool open = true;
  for (Message message = receive(pipe[0], open); open; message = receive(pipe[0], open)) {
    note(message);
  }
  close(pipe[0]);
}

/// A journal that SQLite has to play back: one with a header in it.
bool CrashTest::isJournalHot() {
  std::ifstream journal(kJournal, std::ios::binary);
  return journal.get() > 0;
}

void CrashTest::expectPrivateFiles() {
  for (const char* path : {kDatabase, kJournal}) {
    struct stat status {};
    if (stat(path, &status) != 0) continue;
    EXPECT_EQ(status.st_mode & 0777U, 0600U) << path;
  }
}

void CrashTest::expectNextProcessReady() {
  KELDOAUTHSERVER::OAUTHDBLog log(names::kLogTable);
  Json::Value count;
  EXPECT_NE(log.DBGetRowCount(count), 0);
  EXPECT_EQ(log.GetErrCode(), 255);
  EXPECT_FALSE(isJournalHot());
}

/// The serial is the number at the end of the text in `column`.
Table tableOf(const std::vector<Row>& rows, const char* column) {
  Table table;
  for (Row row : rows) {
    const std::string text = row.at(column);
    const std::size_t digits = text.find_last_not_of("0123456789]");
    const int serial = std::atoi(text.c_str() + digits + 1);
    row.erase(names::kId);
    row.erase(names::kTimestamp);
    EXPECT_TRUE(table.emplace(serial, row).second) << "twice: " << text;
  }
  return table;
}

void CrashTest::expectOneOfTheStates() {
  EXPECT_EQ(sqlText("PRAGMA integrity_check"), "ok");
  const State found{tableOf(sql("SELECT * FROM oauth_clientInfo"), names::kDisplayName),
                    tableOf(sql("SELECT * FROM oauth_grantCode"), names::kUsername),
                    tableOf(sql("SELECT * FROM oauth_token"), names::kUsername),
                    tableOf(sql("SELECT * FROM oauth_log"), names::kMsg)};
  EXPECT_THAT(states_, ::testing::Contains(found));
  if (states_.size() > 1) ++interrupted_;
  if (states_.size() > 1 && !(found == states_.front())) ++completed_;
  states_ = {found};
}

TEST_F(CrashTest, FileAgreesWithTheJournalOfItsWriter) {
  const int kills = support::isLongForm() ? 2000 : 100;
  for (int killed = 0; killed < kills && !HasFailure(); ++killed) {
    SCOPED_TRACE("kill " + std::to_string(killed));
    if (killed % 10 == 0) startWithoutFile();
    crash();
    expectPrivateFiles();
    if (isJournalHot()) ++hotJournals_;
    expectNextProcessReady();
    expectPrivateFiles();
    expectOneOfTheStates();
  }
  // Otherwise no kill struck where it hurts.
  EXPECT_GT(hotJournals_, 0);
  EXPECT_GT(interrupted_, 0);

  RecordProperty("kills", kills);
  RecordProperty("hot_journals", hotJournals_);
  RecordProperty("within_operation", interrupted_);
  RecordProperty("done_all_the_same", completed_);
}

}  // namespace
}  // namespace load
