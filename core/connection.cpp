#include "core/connection.h"

#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>

#include <cerrno>

#include "core/lock_wait.h"
#include "core/privilege.h"
#include "utils/oauth_names.h"
#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {
namespace {

// Creation ------------------------------------------------------------------

constexpr mode_t kOwnersAlone = S_IRUSR | S_IWUSR;

/// The umask, or a default ACL of the folder, may have taken rights from the
/// owner, too. Nothing is given to a file that another put in the place.
void completeOwnersRights(const char* path) {
  struct stat file {};
  if (lstat(path, &file) != 0 || !S_ISREG(file.st_mode) || file.st_size != 0) return;

  const mode_t mode = file.st_mode & ~static_cast<mode_t>(S_IFMT);
  if (mode == kOwnersAlone || (mode & ~kOwnersAlone) != 0) return;
  // Where this is refused, so is the opening that follows, and says so.
  [[maybe_unused]] const int result = fchmodat(AT_FDCWD, path, kOwnersAlone, AT_SYMLINK_NOFOLLOW);
}

/// Whether the way to the file is closed, so that SQLite cannot create one.
bool isWayClosed(int error) {
  return error == ENOENT || error == ENOTDIR || error == EACCES || error == EROFS ||
         error == ELOOP || error == ENAMETOOLONG;
}

/// Creates the file unless it is there, for its owner alone: SQLite would give
/// it the mode that the umask leaves, and would create what a link into nowhere
/// points at. False when SQLite must not be asked, lest it do so after all.
///
/// No descriptor of the file is opened. Another thread may have opened the new
/// file through SQLite already, and to close any descriptor of it would drop
/// that thread's locks: POSIX locks belong to the process, and end with the
/// first descriptor of the file that it closes.
bool isReadyToOpen(const char* path) {
  constexpr int kTries = 16;  // a file may come and go meanwhile
  for (int i = 0; i < kTries; ++i) {
    struct stat file {};
    if (stat(path, &file) == 0) return true;
    if (mknod(path, S_IFREG | kOwnersAlone, 0) == 0) {
      completeOwnersRights(path);
      return true;
    }
    if (isWayClosed(errno)) return true;
    if (errno != EEXIST && errno != EINTR) return false;
  }
  return false;  // a link into nowhere stays one
}

/// sqlite3_open finds errno as the privilege switch has left it.
int createAndOpen(const char* path, sqlite3*& db) {
  const int switchError = errno;
  const bool isReady = isReadyToOpen(path);
  errno = switchError;
  return isReady ? sqlite3_open(path, &db) : SQLITE_CANTOPEN;
}

}  // namespace

int openConnection(const char* source, sqlite3*& db) {
  db = nullptr;
  int result = SQLITE_OK;
  {
    const RaisedPrivilege privilege(source);
    result = createAndOpen(names::kDatabaseFile, db);
    if (result != SQLITE_OK) {
      sqlite3_close(db);  // a failed open may hand out a handle all the same
      db = nullptr;
    }
  }
  if (db != nullptr) sqlite3_busy_handler(db, waitForLock<kLockWaitSeconds>, nullptr);
  return result;
}

int closeConnection(const char* source, sqlite3* db) {
  const RaisedPrivilege privilege(source);
  return sqlite3_close(db);
}

}  // namespace KELDOAUTHSERVER
