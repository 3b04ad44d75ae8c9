// SQLite's functions as core/ calls them, each in the engine that the
// installation has chosen. The build gives core/'s calls these names
// (cmake/engine.cmake); the sources know SQLite alone.

#ifndef KELDOAUTH_ENGINES_CHOICE_ENGINE_CALLS_H
#define KELDOAUTH_ENGINES_CHOICE_ENGINE_CALLS_H

#include <sqlite3.h>

extern "C" {

/// Where `path` is the link of names::kServerLink, the store is on a server, and
/// the library that knows it opens it: SQLITE_CANTOPEN without that library, or
/// when the server cannot be reached. Everything else is SQLite's to open.
int keldoauth_engine_open(const char* path, sqlite3** db);

// Of a connection that this opened. Contracts and results are SQLite's.
int keldoauth_engine_close(sqlite3* db);
int keldoauth_engine_exec(sqlite3* db, const char* sql, sqlite3_callback callback, void* arg,
                          char** text);
int keldoauth_engine_changes(sqlite3* db);
int keldoauth_engine_get_autocommit(sqlite3* db);
int keldoauth_engine_busy_handler(sqlite3* db, int (*handler)(void*, int), void* arg);

}  // extern "C"

#endif  // KELDOAUTH_ENGINES_CHOICE_ENGINE_CALLS_H
