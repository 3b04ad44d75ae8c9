// The baseline: the statements that the library sends, through bare
// sqlite3_exec on a connection of SQLite's defaults.

#ifndef KELDOAUTH_BENCH_BARE_STORE_H
#define KELDOAUTH_BENCH_BARE_STORE_H

#include <sqlite3.h>

#include <string>

namespace bench {

class BareStore {
 public:
  /// Opens the file and runs the statements of the library's start-up.
  BareStore();
  ~BareStore();
  BareStore(const BareStore&) = delete;
  BareStore& operator=(const BareStore&) = delete;

  /// Ends the program when the statement fails.
  void run(const std::string& sql);
  /// The same with a callback that looks at nothing.
  void select(const std::string& sql);

  void registerClient(long long serial);
  void issueToken(long long serial);
  void writeAuditEntry(const std::string& message, int limit);

 private:
  sqlite3* db_ = nullptr;
};

/// A token of 64 hexadecimal digits that no other serial has. One after the other
/// they scatter over an index, as drawn ones do.
std::string tokenText(long long serial);

/// What the platform's cipher makes of an identifier; the same for all rows.
const std::string& clientIdCipher();

}  // namespace bench

#endif  // KELDOAUTH_BENCH_BARE_STORE_H
