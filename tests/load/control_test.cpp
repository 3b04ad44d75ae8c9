// The same load without the wait for locks: most rounds fail, which shows that
// the load is one. What is acknowledged is true even then.

#include <sqlite3.h>

#include <algorithm>

#include "tests/load/crowd.h"

/// Takes the place of SQLite's: the library's connections do not wait.
extern "C" int sqlite3_busy_handler(sqlite3* /*db*/, int (* /*handler*/)(void*, int),
                                    void* /*argument*/) {
  return SQLITE_OK;
}

namespace load {
namespace {

bool isAboutLocks(const std::string& failure) {
  return failure.find("database is locked") != std::string::npos;
}

class ControlTest : public Crowd {
 protected:
  static void expectMostRoundsFail(Size size) {
    const Ledger ledger = visit(size);
    report(ledger);
    EXPECT_GT(ledger.failedRounds, ledger.rounds / 2);
    EXPECT_TRUE(std::any_of(ledger.failures.begin(), ledger.failures.end(), isAboutLocks));
    expectAsAcknowledged(ledger);
  }
};

TEST_F(ControlTest, MostRoundsOfFewBusyProcessesFail) {
  expectMostRoundsFail(fewBusyProcesses());
}

TEST_F(ControlTest, MostRoundsOfManyProcessesFail) {
  expectMostRoundsFail(manyProcesses());
}

}  // namespace
}  // namespace load
