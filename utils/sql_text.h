// SQLite's own text: its memory, and the quoting behind getSQLFormatStr for
// callers that have an exception boundary of their own: a store must refuse an
// operation when memory runs out while it copies a value, not store an empty
// text instead.

#ifndef KELDOAUTH_UTILS_SQL_TEXT_H
#define KELDOAUTH_UTILS_SQL_TEXT_H

#include <sqlite3.h>

#include <memory>
#include <string>

namespace KELDOAUTHSERVER {

struct SqliteFree {
  void operator()(char* text) const { sqlite3_free(text); }
};
/// A text that SQLite allocated.
using SqliteText = std::unique_ptr<char, SqliteFree>;

/// As getSQLFormatStr, but throws std::bad_alloc when the copy fails. Empty,
/// with the log line, when SQLite itself has no memory.
std::string quoteSql(const std::string& value);

/// As getSQLFormatLikeStr; fails as quoteSql does.
std::string likeSql(const std::string& column, const std::string& value);

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_UTILS_SQL_TEXT_H
