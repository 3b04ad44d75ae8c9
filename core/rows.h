// Rows as SQLite hands them to a callback.

#ifndef KELDOAUTH_CORE_ROWS_H
#define KELDOAUTH_CORE_ROWS_H

#include <json/value.h>

namespace KELDOAUTHSERVER {

/// The text of a column, or its name; a NULL is the empty text.
inline const char* textOf(const char* value) {
  return value != nullptr ? value : "";
}

/// How many columns can be read; none where the callback was called by hand and
/// without them.
inline int readableColumns(int count, char** values, char** columns) {
  return values != nullptr && columns != nullptr ? count : 0;
}

/// The row as an object of texts.
Json::Value rowDocument(int count, char** values, char** columns);

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_CORE_ROWS_H
