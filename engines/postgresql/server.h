// A connection to the one server that takes changes, and what is said over it.

#ifndef KELDOAUTH_ENGINES_POSTGRESQL_SERVER_H
#define KELDOAUTH_ENGINES_POSTGRESQL_SERVER_H

#include <libpq-fe.h>

#include <memory>
#include <string>
#include <vector>

#include "engines/postgresql/connection_text.h"

namespace keldoauth::postgresql {

struct FinishConnection {
  void operator()(PGconn* connection) const { PQfinish(connection); }
};
struct ClearResult {
  void operator()(PGresult* result) const { PQclear(result); }
};
using Result = std::unique_ptr<PGresult, ClearResult>;

/// What came back for the statements of one text, in order.
struct Reply {
  std::vector<Result> results;
  /// The connection ended, or the deadline came, before all was answered. The
  /// connection is gone then.
  bool isCutOff = false;
  /// The server warned of something: a commit that it did not wait for.
  bool hasWarning = false;

  /// The first that failed; null when none did.
  [[nodiscard]] const PGresult* failure() const;
};

class Server {
 public:
  /// Asks all servers at once and takes the first that is the store's and takes
  /// changes; while one of them is a standby, which may become the primary any
  /// moment, asks again. False, with the reason in words, after the deadline, or
  /// at once when none of them can be reached.
  bool connect(const Servers& servers, std::string& reason);

  /// Looks without waiting whether the other side has hung up.
  bool isConnected();

  /// Only while connected. Waits as long as an answer may take.
  Reply ask(const std::string& text);

  void disconnect() { connection_.reset(); }

  /// As the opening found them: the text that the store's key gives, empty in a
  /// store without one, and the tables' names, a blank before and behind each.
  [[nodiscard]] const std::string& seal() const { return seal_; }
  [[nodiscard]] const std::string& tables() const { return tables_; }

  /// Leaves the connection to another process that has it, too: a fork.
  void abandon() { static_cast<void>(connection_.release()); }

 private:
  std::unique_ptr<PGconn, FinishConnection> connection_;
  std::string seal_;
  std::string tables_;
  bool saidFarewell_ = false;
};

}  // namespace keldoauth::postgresql

#endif  // KELDOAUTH_ENGINES_POSTGRESQL_SERVER_H
