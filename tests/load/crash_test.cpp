// A writer is killed at a random moment, again and again on the same file. What
// it was told is done is done, what it was doing is done or not, and the next
// process finds the file in order.

#include <fcntl.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <ctime>
#include <fstream>

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

/// How much a writer gets done before it is killed: some messages, and then up
/// to so long, which is more than a transaction takes on a disk.
constexpr unsigned kMostMessages = 8;
constexpr unsigned kLongestMicroseconds = 20000;

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

  static constexpr char kJournal[] = "/var/packages/Corvane/target/etc/oauth.db-journal";

  mode_t umask_ = 0;
  int serial_ = 1;
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

void CrashTest::crash() {
  int pipe[2];
  ASSERT_EQ(pipe2(pipe, O_CLOEXEC), 0);
  const auto seed = static_cast<unsigned>(random_());
  const pid_t writer = startProcess([&] { writeForEver(pipe[1], states_.front(), serial_, seed); });
  close(pipe[1]);

  bool open = true;
  for (auto messages = random_() % kMostMessages; open && messages > 0; --messages) {
    note(receive(pipe[0], open));
  }
  const timespec moment{0, static_cast<long>(random_() % kLongestMicroseconds) * 1000};
  nanosleep(&moment, nullptr);
  kill(writer, SIGKILL);
  int status = 0;
  waitpid(writer, &status, 0);
  EXPECT_TRUE(WIFSIGNALED(status)) << "the writer ended by itself";

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
