// A login over bare SQLite, as a careful program would write it: prepared
// statements, every row found by a key, two commits. It has no bounds, draws
// nothing and digests nothing.

#ifndef KELDOAUTH_BENCH_BARE_LOGIN_H
#define KELDOAUTH_BENCH_BARE_LOGIN_H

#include <sqlite3.h>

#include <array>
#include <string>

#include "bench/bare_store.h"

namespace bench {

class BareLogin {
 public:
  /// Opens the file, in which the tables are.
  explicit BareLogin(Sync sync = Sync::kExtra);
  ~BareLogin();
  BareLogin(const BareLogin&) = delete;
  BareLogin& operator=(const BareLogin&) = delete;

  // One commit each, which ends the program when it fails. The application is
  // looked up first, as whoever acts on its behalf must.

  void issueCode(long long serial);
  /// Spends the code of that serial and stores a pair.
  void redeem(long long serial);
  /// Replaces the pair of a row.
  void refresh(long long row, long long serial);

 private:
  enum Statement {
    kBegin,
    kCommit,
    kFindApplication,
    kInsertCode,
    kFindCode,
    kSpendCode,
    kInsertToken,
    kFindToken,
    kReplaceToken,
    kStatements
  };

  sqlite3_stmt* at(Statement statement);
  void bind(Statement statement, int place, const std::string& text);
  void bind(Statement statement, int place, long long number);
  /// Whether it gave a row.
  bool run(Statement statement);

  sqlite3* db_ = nullptr;
  std::array<sqlite3_stmt*, kStatements> prepared_{};
};

}  // namespace bench

#endif  // KELDOAUTH_BENCH_BARE_LOGIN_H
