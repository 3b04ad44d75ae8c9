// A database file as SQLite sees it, for what the library has no business with:
// copying whole databases.

#ifndef KELDOAUTH_TOOLS_DATABASE_FILE_H
#define KELDOAUTH_TOOLS_DATABASE_FILE_H

#include <string>

struct sqlite3;

namespace tool {

class DatabaseFile {
 public:
  enum class Use { kRead, kWrite };

  /// Opens an existing file; statements wait up to 30 seconds for locks.
  /// Throws Failure.
  DatabaseFile(const std::string& path, Use use);
  ~DatabaseFile();
  DatabaseFile(const DatabaseFile&) = delete;
  DatabaseFile& operator=(const DatabaseFile&) = delete;

  /// Throws unless SQLite finds the file whole and every table of the store is
  /// in it.
  void requireStore();

  /// Makes `target` a copy of this database as of one moment, in one
  /// transaction of `target`, while others read and write either. Throws.
  void copyTo(DatabaseFile& target);

 private:
  std::string text(const std::string& sql);
  [[noreturn]] void fail();

  std::string path_;
  sqlite3* db_ = nullptr;
};

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_DATABASE_FILE_H
