// The world where the installation has chosen a server: the same tests, the
// store on the server that tests/postgresql/with-server made for them.

#ifndef KELDOAUTH_TESTS_SUPPORT_SERVER_WORLD_H
#define KELDOAUTH_TESTS_SUPPORT_SERVER_WORLD_H

#include <sqlite3.h>

namespace support {

/// SQLite's functions for a look at the store beside the library, or those that
/// stand in their place.
struct StoreCalls {
  decltype(&sqlite3_open) open;
  decltype(&sqlite3_exec) exec;
  decltype(&sqlite3_free) free;
  decltype(&sqlite3_close) close;
};
StoreCalls storeCalls();

/// Whether the store is to be on the server.
bool isOnServer();

/// Chooses the server in the state folder, empties it, and puts a key in place.
void chooseServer();

}  // namespace support

#endif  // KELDOAUTH_TESTS_SUPPORT_SERVER_WORLD_H
