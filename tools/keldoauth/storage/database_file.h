// A database file as SQLite sees it, for what the library has no business with:
// copying whole databases.

#ifndef KELDOAUTH_TOOLS_DATABASE_FILE_H
#define KELDOAUTH_TOOLS_DATABASE_FILE_H

#include <cstdint>
#include <map>
#include <memory>
#include <string>

#include "tools/keldoauth/console/failure.h"

struct sqlite3;

namespace tool {

class Draft;

class DatabaseFile {
 public:
  /// kRead never writes, so that it refuses a file that a crash left in need of
  /// a roll-back. What kWrite commits is on the disk, its journal's removal
  /// included, when the call returns. kMemory is no file: empty at first, private,
  /// gone with the object, and `path` only names it in messages.
  enum class Use { kRead, kWrite, kMemory };

  /// Opens an existing file; statements wait up to 30 seconds for locks.
  /// Throws Failure.
  DatabaseFile(const std::string& path, Use use);

  /// Writes through the draft's descriptor, and syncs nothing. Throws Failure.
  explicit DatabaseFile(const Draft& draft);
  DatabaseFile(const DatabaseFile&) = delete;
  DatabaseFile& operator=(const DatabaseFile&) = delete;

  /// Throws kRefused unless SQLite finds the file whole and every table of the
  /// store is in it with its columns.
  void requireStore();

  /// What is in it beside the store's own tables, as the library makes them:
  /// "trigger spy", empty for nothing. SQLite's own tables do not count. Throws.
  std::string stranger();

  /// Stands for the rows of all tables: two stores with different ones have
  /// different digests, chance aside. Throws.
  std::uint64_t digest();

  /// Makes `target` a copy of this database as of one moment, in one
  /// transaction of `target`, while others read and write either. Throws.
  void copyTo(DatabaseFile& target);

 private:
  struct CloseConnection {
    void operator()(sqlite3* db) const;
  };

  void open(const std::string& name, int flags, const char* vfs);
  void execute(const std::string& sql);
  std::string text(const std::string& sql);
  std::map<std::string, std::string> schemaEntries();
  [[nodiscard]] Failure failure() const;
  [[nodiscard]] Failure failure(int code) const;

  std::string path_;
  Use use_;
  std::unique_ptr<sqlite3, CloseConnection> db_;
};

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_DATABASE_FILE_H
