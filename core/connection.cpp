#include "core/connection.h"

#include <sqlite3.h>
#include <sys/stat.h>

#include <ctime>

#include "core/privilege.h"
#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER {
namespace {

constexpr long long kLockWaitMilliseconds = 5000;
constexpr long kLockStepNanoseconds = 1000000;

long long monotonicMilliseconds() {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC, &now);
  return static_cast<long long>(now.tv_sec) * 1000 + now.tv_nsec / 1000000;
}

/// SQLite's busy handler; `waits` counts from 0 in each statement. Short even
/// steps: the growing ones of SQLite's own handler starve some of many writers.
int waitForLock(void* /*unused*/, int waits) {
  thread_local long long waitingSince = 0;
  const long long now = monotonicMilliseconds();
  if (waits == 0) waitingSince = now;
  if (now - waitingSince >= kLockWaitMilliseconds) return 0;

  const timespec step{0, kLockStepNanoseconds};
  nanosleep(&step, nullptr);
  return 1;
}

/// A file that is created within the scope is its owner's alone.
class PrivateUmask {
 public:
  PrivateUmask() : previous_(umask(S_IRWXG | S_IRWXO)) {}
  ~PrivateUmask() { umask(previous_); }
  PrivateUmask(const PrivateUmask&) = delete;
  PrivateUmask& operator=(const PrivateUmask&) = delete;

 private:
  mode_t previous_;
};

}  // namespace

int openConnection(const char* source, sqlite3*& db) {
  int result = SQLITE_OK;
  {
    const PrivateUmask creationMask;
    const RaisedPrivilege privilege(source);
    result = sqlite3_open(names::kDatabaseFile, &db);
    if (result != SQLITE_OK) {
      sqlite3_close(db);  // a failed open may hand out a handle all the same
      db = nullptr;
    }
  }
  if (db != nullptr) sqlite3_busy_handler(db, waitForLock, nullptr);
  return result;
}

int closeConnection(const char* source, sqlite3* db) {
  const RaisedPrivilege privilege(source);
  return sqlite3_close(db);
}

}  // namespace KELDOAUTHSERVER
