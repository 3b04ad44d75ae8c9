// A database file as SQLite sees it, for what the library has no business with:
// copying whole databases.

#ifndef KELDOAUTH_TOOLS_DATABASE_FILE_H
#define KELDOAUTH_TOOLS_DATABASE_FILE_H

#include <memory>
#include <string>

#include "tools/keldoauth/console/failure.h"

struct sqlite3;

namespace tool {

class DatabaseFile {
 public:
  /// kRead never writes, so that it refuses a file that a crash left in need of
  /// a roll-back.
  enum class Use { kRead, kWrite };

  /// Opens an existing file; statements wait up to 30 seconds for locks.
  /// Throws Failure.
  DatabaseFile(const std::string& path, Use use);
  DatabaseFile(const DatabaseFile&) = delete;
  DatabaseFile& operator=(const DatabaseFile&) = delete;

  /// From here to the end all is read as of one moment. Throws.
  void holdStill();

  /// Throws kRefused unless SQLite finds the file whole and every table of the
  /// store is in it with its columns.
  void requireStore();

  /// Makes `target` a copy of this database as of one moment, in one
  /// transaction of `target`, while others read and write either. Throws.
  void copyTo(DatabaseFile& target);

  /// Makes it a file that needs no other beside it. Throws.
  void leaveWal();

 private:
  struct CloseConnection {
    void operator()(sqlite3* db) const;
  };

  std::string text(const std::string& sql);
  [[nodiscard]] Failure failure() const;
  [[nodiscard]] Failure failure(int code) const;

  std::string path_;
  Use use_;
  std::unique_ptr<sqlite3, CloseConnection> db_;
};

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_DATABASE_FILE_H
