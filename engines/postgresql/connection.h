// What the core has as its connection.

#ifndef KELDOAUTH_ENGINES_POSTGRESQL_CONNECTION_H
#define KELDOAUTH_ENGINES_POSTGRESQL_CONNECTION_H

#include <sys/types.h>

#include <string>

#include "engines/postgresql/connection_text.h"
#include "engines/postgresql/result_codes.h"
#include "engines/postgresql/server.h"
#include "engines/postgresql/statement.h"

namespace keldoauth::postgresql {

/// As sqlite3_exec takes it.
using RowCallback = int (*)(void*, int, char**, char**);

class Connection {
 public:
  explicit Connection(Servers servers);
  ~Connection();
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;

  /// Reaches the server. False, with the reason in words.
  bool open(std::string& reason);

  /// Runs the statements of a text up to the first that fails. `callback` may be
  /// null.
  Verdict run(const char* sql, RowCallback callback, void* arg);

  /// Rows that the last INSERT, UPDATE or DELETE changed.
  [[nodiscard]] int changes() const { return changes_; }

  [[nodiscard]] bool isInTransaction() const { return state_ != State::kNone; }

 private:
  enum class State {
    kNone,  // each statement for itself
    kOpen,  // on the server, without the lock that changes take
    kLocked,
    kLost,  // the connection went with it: until COMMIT or ROLLBACK nothing runs
  };

  Verdict runOne(const Statement& statement, RowCallback callback, void* arg);
  Verdict begin(Statement::Kind kind);
  Verdict commit();
  Verdict rollBack();
  Verdict create(const Statement& statement);
  Verdict runAlone(const Statement& statement, RowCallback callback, void* arg);
  Verdict runWithin(const Statement& statement, RowCallback callback, void* arg);
  Verdict take(const Reply& reply, std::size_t at, RowCallback callback, void* arg);

  /// The statement that takes the lock for changes and compares the keys; empty
  /// with the verdict set when this box has no key that works.
  std::string lock(Verdict& refused) const;
  Verdict requireKey() const;

  /// Takes up another connection where the one there was has ended.
  Verdict reach();
  Reply ask(const std::string& text);

  const Servers servers_;
  const pid_t owner_;
  Server server_;
  State state_ = State::kNone;
  int changes_ = 0;
  std::string known_;  // tables that the opening saw, and nobody asked for yet
};

}  // namespace keldoauth::postgresql

#endif  // KELDOAUTH_ENGINES_POSTGRESQL_CONNECTION_H
