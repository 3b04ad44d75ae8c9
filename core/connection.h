// The connection to the database file: opened and closed with raised
// privileges, created for its owner alone, patient with other writers.

#ifndef KELDOAUTH_CORE_CONNECTION_H
#define KELDOAUTH_CORE_CONNECTION_H

struct sqlite3;

namespace KELDOAUTHSERVER {

/// Opens names::kDatabaseFile. A file that is created has mode 0600, whatever
/// the umask, which stays untouched, and the folder's default ACL; one that is
/// there is left as it is. A symbolic link that leads nowhere creates nothing:
/// SQLITE_CANTOPEN. Statements of the connection wait up to kLockWaitSeconds for
/// other connections' locks.
/// Returns SQLite's result code; `db` is null unless it is SQLITE_OK. Lines of
/// the privilege switch go under `source`.
int openConnection(const char* source, sqlite3*& db);

/// Closes `db` and returns SQLite's result code.
int closeConnection(const char* source, sqlite3* db);

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_CORE_CONNECTION_H
