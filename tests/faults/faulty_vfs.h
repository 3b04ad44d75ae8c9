// A file system for SQLite that fails as a test wants: a shim over SQLite's
// own VFS that asks a medium before every call and tells it of every change.

#ifndef KELDOAUTH_TESTS_FAULTS_FAULTY_VFS_H
#define KELDOAUTH_TESTS_FAULTS_FAULTY_VFS_H

#include <sqlite3.h>

#include <cstdint>
#include <string>
#include <vector>

namespace faults {

enum class Call {
  kOpen,
  kRead,
  kWrite,
  kSync,
  kTruncate,
  kDelete,
  kLock,
  kAccess,
  kFileSize,
  kCheckReservedLock,
};

/// SQLite's code for a call of this kind that fails.
int errorOf(Call call);

/// What lies under the file system. Whatever a member returns is what SQLite
/// gets; SQLITE_OK lets things take their course. Paths are absolute and empty
/// for SQLite's temporary files.
class Medium {
 public:
  virtual ~Medium() = default;

  /// Before the call is carried out.
  virtual int permit(Call call) = 0;

  // After a change was carried out on the real file.

  virtual int created(const std::string& /*path*/) { return SQLITE_OK; }
  virtual int wrote(const std::string& /*path*/, std::int64_t /*offset*/,
                    const std::string& /*bytes*/) {
    return SQLITE_OK;
  }
  virtual int truncated(const std::string& /*path*/, std::int64_t /*size*/) { return SQLITE_OK; }
  /// `folder` says that the folder's entries were written out, too.
  virtual int synced(const std::string& /*path*/, bool /*folder*/) { return SQLITE_OK; }
  virtual int removed(const std::string& /*path*/, bool /*folder*/) { return SQLITE_OK; }
};

/// While it lives, every connection that is opened goes through the shim to
/// `medium`. It has to outlive those connections.
class FaultyVfs {
 public:
  explicit FaultyVfs(Medium& medium);
  ~FaultyVfs();
  FaultyVfs(const FaultyVfs&) = delete;
  FaultyVfs& operator=(const FaultyVfs&) = delete;

  /// Files that others than their owner could read at the moment in which they
  /// were opened.
  [[nodiscard]] const std::vector<std::string>& exposed() const { return exposed_; }

  /// The name under which SQLite's own VFS can always be had.
  static constexpr char kPlain[] = "unix";

  // For the shim's functions, which SQLite calls.
  Medium& medium() { return medium_; }
  void noteMode(const std::string& path);

 private:
  Medium& medium_;
  sqlite3_vfs* previous_;
  sqlite3_vfs vfs_;
  std::vector<std::string> exposed_;
};

}  // namespace faults

#endif  // KELDOAUTH_TESTS_FAULTS_FAULTY_VFS_H
