// The baseline: the statements that the library sends, through bare
// sqlite3_exec. It is as durable as the library, or as durable as SQLite is by
// default, which a power cut may cost the last change.

#ifndef KELDOAUTH_BENCH_BARE_STORE_H
#define KELDOAUTH_BENCH_BARE_STORE_H

#include <sqlite3.h>

#include <string>

namespace bench {

/// How far `PRAGMA synchronous` goes.
enum class Sync {
  kExtra,  // as in the library: the folder is synced after the journal is gone
  kFull,   // SQLite's default
};

class BareStore {
 public:
  /// Opens the file and runs the statements of the library's start-up.
  explicit BareStore(Sync sync = Sync::kExtra);
  ~BareStore();
  BareStore(const BareStore&) = delete;
  BareStore& operator=(const BareStore&) = delete;

  void startUp();

  /// Ends the program when the statement fails.
  void run(const std::string& sql);
  /// The same with a callback that looks at nothing.
  void select(const std::string& sql);

  void registerClient(long long serial);
  void issueToken(long long serial);
  void writeAuditEntry(const std::string& message, int limit);

 private:
  Sync sync_;
  sqlite3* db_ = nullptr;
};

/// A token of 64 hexadecimal digits that no other serial has. One after the other
/// they scatter over an index, as drawn ones do.
std::string tokenText(long long serial);

/// What the platform's cipher makes of an identifier; the same for all rows.
const std::string& clientIdCipher();

/// The one registered application, to which no row belongs at first.
std::string applicationId();
const std::string& applicationIdCipher();

}  // namespace bench

#endif  // KELDOAUTH_BENCH_BARE_STORE_H
