// Files that must be whole on disk before anybody relies on them.

#ifndef KELDOAUTH_TOOLS_FILES_H
#define KELDOAUTH_TOOLS_FILES_H

#include <cstdint>
#include <string>

#include "tools/keldoauth/console/failure.h"
#include "utils/descriptor.h"

namespace tool {

/// "<path>: <the system's reason>".
Failure systemFailure(const std::string& path);

/// Throws Failure unless `path` is a file that can be read.
void requireReadableFile(const std::string& path);

bool isSameFile(const std::string& one, const std::string& other);

/// Makes new, changed and removed names in the folder of `path` survive a power
/// cut. Throws Failure.
void syncFolderOf(const std::string& path);

using KELDOAUTHSERVER::Descriptor;

/// A file that is to be `path` once it is whole: the owner's alone, empty at
/// first, and gone with the scope unless it was published. It is written through
/// its descriptor only. It has no name as long as it is a draft, so that nobody
/// who may write the folder can put another file in its place; on media that
/// know no such files it has one of its own, which nothing is written by.
class Draft {
 public:
  /// Throws Failure, also when `path` is there already.
  explicit Draft(const std::string& path);
  ~Draft();
  Draft(const Draft&) = delete;
  Draft& operator=(const Draft&) = delete;

  [[nodiscard]] const std::string& path() const { return path_; }
  [[nodiscard]] int descriptor() const { return file_.get(); }
  [[nodiscard]] std::uintmax_t size() const;

  /// Brings the file to the disk and gives it the name `path`, never another
  /// file's place. Throws Failure; one that names the folder leaves the file
  /// there, whole.
  void publish();

 private:
  int create();
  [[nodiscard]] bool moveToFreeName() const;
  [[nodiscard]] bool isInPlace() const;

  std::string path_;
  std::string base_;
  std::string draftName_;  // empty without one
  Descriptor folder_;
  Descriptor file_;
};

/// Keeps commands apart that must not change database or key at the same time.
/// The lock is on the folder of the database, so that it leaves no file and
/// ends with its process.
class MaintenanceLock {
 public:
  /// Throws Failure, at once when another command has it.
  MaintenanceLock();

 private:
  Descriptor folder_;
};

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_FILES_H
