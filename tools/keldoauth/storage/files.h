// Files that must be whole on disk before anybody relies on them.

#ifndef KELDOAUTH_TOOLS_FILES_H
#define KELDOAUTH_TOOLS_FILES_H

#include <string>

#include "tools/keldoauth/console/failure.h"

namespace tool {

/// "<path>: <the system's reason>".
Failure systemFailure(const std::string& path);

/// Throws Failure unless `path` is a file that can be read.
void requireReadableFile(const std::string& path);

bool isSameFile(const std::string& one, const std::string& other);

/// Makes new, changed and removed names in the folder of `path` survive a power
/// cut, as far as the system allows.
void syncFolderOf(const std::string& path);

/// A file of the owner's alone under a name of its own beside `path`: empty at
/// first, and gone with the scope, together with what SQLite put beside it,
/// unless it was published.
class Draft {
 public:
  /// Throws Failure, also when `path` is there already.
  explicit Draft(const std::string& path);
  ~Draft();
  Draft(const Draft&) = delete;
  Draft& operator=(const Draft&) = delete;

  [[nodiscard]] const std::string& name() const { return name_; }

  /// Gives the file the name `path`, and never another file's place. Throws
  /// Failure.
  void publish() const;

 private:
  std::string path_;
  std::string name_;
};

/// Keeps commands apart that must not change database or key at the same time.
/// The lock is on the folder of the database, so that it leaves no file and
/// ends with its process.
class MaintenanceLock {
 public:
  /// Throws Failure, at once when another command has it.
  MaintenanceLock();
  ~MaintenanceLock();
  MaintenanceLock(const MaintenanceLock&) = delete;
  MaintenanceLock& operator=(const MaintenanceLock&) = delete;

 private:
  int folder_;
};

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_FILES_H
