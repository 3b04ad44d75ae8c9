// Calls that the tests make and that the SQLite inside Debian's SQLCipher is too
// old for. They do nothing, so that the cases which need them fail by name.

#ifndef KELDOAUTH_TESTS_SQLCIPHER_NEWER_CALLS_H
#define KELDOAUTH_TESTS_SQLCIPHER_NEWER_CALLS_H

#include <sqlite3.h>

#if SQLITE_VERSION_NUMBER < 3031000
inline sqlite3_int64 sqlite3_hard_heap_limit64(sqlite3_int64 /*limit*/) {
  return -1;
}
#endif

#endif  // KELDOAUTH_TESTS_SQLCIPHER_NEWER_CALLS_H
