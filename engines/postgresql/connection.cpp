#include "engines/postgresql/connection.h"

#include <unistd.h>

#include <cstdlib>
#include <utility>
#include <vector>

#include "engines/postgresql/expression.h"
#include "engines/postgresql/key.h"

namespace keldoauth::postgresql {
namespace {

using Kind = Statement::Kind;

constexpr char kUnknown[] =
    "outcome unknown: the server was asked to commit and has not confirmed it";
constexpr char kLostText[] =
    "disk I/O error: the connection to the server was lost, and the transaction with it";
constexpr char kNotReached[] = "disk I/O error: the server cannot be reached";
constexpr char kCutOff[] = "disk I/O error: the server did not answer, and nothing was changed";

Verdict verdict(int code, const char* text = nullptr) {
  return {code, text != nullptr ? text : standingText(code)};
}

/// One value to the callback, as a row.
Verdict giveNumber(int number, const char* column, RowCallback callback, void* arg) {
  if (callback == nullptr) return {};
  std::string value = std::to_string(number);
  std::string name = column;
  char* values[] = {value.data()};
  char* names[] = {name.data()};
  return callback(arg, 1, values, names) == 0 ? Verdict{} : verdict(kAbort);
}

Verdict giveRows(PGresult* result, RowCallback callback, void* arg) {
  const int columns = PQnfields(result);
  std::vector<char*> names;
  names.reserve(static_cast<std::size_t>(columns));
  for (int i = 0; i < columns; ++i) names.push_back(PQfname(result, i));
  std::vector<char*> values(names.size());
  for (int row = 0; row < PQntuples(result); ++row) {
    for (int i = 0; i < columns; ++i) {
      values[static_cast<std::size_t>(i)] =
          PQgetisnull(result, row, i) != 0 ? nullptr : PQgetvalue(result, row, i);
    }
    if (callback(arg, columns, values.data(), names.data()) != 0) return verdict(kAbort);
  }
  return {};
}

/// Whether what was seen of the tables a moment ago may be no longer so.
bool changesTables(Kind kind) {
  return kind == Kind::kWrite || kind == Kind::kCreate || kind == Kind::kBegin ||
         kind == Kind::kBeginImmediate;
}

/// A literal of a text without quotes, which a ciphertext need not be.
std::string literal(const std::string& text) {
  std::string quoted = "'";
  for (const char c : text) quoted.append(c == '\'' ? 2 : 1, c);
  return quoted + "'";
}

}  // namespace

Connection::Connection(Servers servers) : servers_(std::move(servers)), owner_(getpid()) {}

/// A child that was forked has the socket, too: what it says on it would be said
/// in the parent's name.
Connection::~Connection() {
  if (getpid() != owner_) server_.abandon();
}

bool Connection::open(std::string& reason) {
  if (!server_.connect(servers_, reason)) return false;
  known_ = server_.tables();  // the start-up of a store comes next
  return true;
}

// Asking ----------------------------------------------------------------------------

/// A resident process finds its connection gone after a failover or an idle
/// night: it takes up another, but never within a transaction.
Verdict Connection::reach() {
  if (server_.isConnected()) return {};
  std::string reason;
  return server_.connect(servers_, reason) ? requireKey() : verdict(kIoError, kNotReached);
}

Reply Connection::ask(const std::string& text) {
  Reply reply = server_.ask(text);
  if (reply.isCutOff && state_ != State::kNone) state_ = State::kLost;
  return reply;
}

// The key ---------------------------------------------------------------------------

std::string Connection::lock(Verdict& refused) const {
  const std::string seal = sealOfThisBox();
  if (seal.empty()) refused = verdict(kAuth, kKeyFails);
  return seal.empty() ? "" : std::string("SELECT ") + kSchema + "write_lock(" + literal(seal) + ")";
}

/// Looked at by the first statement of a connection, which the core runs before
/// all others: what comes back is said on the object.
Verdict Connection::requireKey() const {
  if (server_.seal().empty()) return {};
  const std::string seal = sealOfThisBox();
  if (seal.empty()) return verdict(kAuth, kKeyFails);
  return seal == server_.seal() ? Verdict{} : verdict(kAuth, kKeyIsAnother);
}

// Transactions ----------------------------------------------------------------------

Verdict Connection::begin(Kind kind) {
  if (state_ != State::kNone) {
    return verdict(kError, "cannot start a transaction within a transaction");
  }
  Verdict refused;
  std::string text = "BEGIN";
  if (kind == Kind::kBeginImmediate) text += ";" + lock(refused);
  if (refused.code != kOk) return refused;
  // Nothing can have happened where the first try was cut off.
  for (int tries = 0; tries < 2; ++tries) {
    if (refused = reach(); refused.code != kOk) return refused;
    const Reply reply = ask(text);
    if (reply.isCutOff) continue;
    if (const PGresult* const failure = reply.failure(); failure != nullptr) {
      refused = verdictOn(failure, {});
      ask("ROLLBACK");
      return refused;
    }
    state_ = kind == Kind::kBeginImmediate ? State::kLocked : State::kOpen;
    return {};
  }
  return verdict(kIoError, kCutOff);
}

Verdict Connection::commit() {
  const State before = std::exchange(state_, State::kNone);
  if (before == State::kNone) {
    return verdict(kError, "cannot commit - no transaction is active");
  }
  if (before == State::kLost) return verdict(kIoError, kLostText);
  if (!server_.isConnected()) return verdict(kIoError, kLostText);  // nothing was sent
  const Reply reply = ask("COMMIT");
  if (const PGresult* const failure = reply.failure(); failure != nullptr && !reply.isCutOff) {
    return verdictOn(failure, {});
  }
  if (reply.isCutOff || reply.hasWarning || reply.results.empty()) {
    return verdict(kIoError, kUnknown);
  }
  // The server answers so, and without an error, when it could only roll back.
  if (std::string(PQcmdStatus(reply.results.back().get())) != "COMMIT") {
    return verdict(kIoError, kLostText);
  }
  return {};
}

Verdict Connection::rollBack() {
  const State before = std::exchange(state_, State::kNone);
  if (before == State::kNone) {
    return verdict(kError, "cannot rollback - no transaction is active");
  }
  // Where it cannot be said, the server does it by itself.
  if (before != State::kLost && server_.isConnected() && ask("ROLLBACK").failure() != nullptr) {
    server_.disconnect();
  }
  return {};
}

// Statements ------------------------------------------------------------------------

Verdict Connection::take(const Reply& reply, std::size_t at, RowCallback callback, void* arg) {
  if (at >= reply.results.size()) return verdict(kIoError, kCutOff);
  PGresult* const result = reply.results[at].get();
  if (PQresultStatus(result) != PGRES_TUPLES_OK) {
    const std::string changed = PQcmdTuples(result);
    if (!changed.empty()) changes_ = static_cast<int>(std::strtol(changed.c_str(), nullptr, 10));
    return {};
  }
  return callback != nullptr ? giveRows(result, callback, arg) : Verdict{};
}

/// A change and its lock are one transaction of the server's; a look is repeated
/// on another connection.
Verdict Connection::runAlone(const Statement& statement, RowCallback callback, void* arg) {
  const bool isRead = statement.kind == Kind::kRead;
  Verdict refused;
  const std::string text = (isRead ? "" : lock(refused) + ";") + statement.text;
  if (refused.code != kOk) return refused;
  for (int tries = 0; tries < 2; ++tries) {
    if (refused = reach(); refused.code != kOk) return refused;
    const Reply reply = ask(text);
    const PGresult* const failure = reply.failure();
    if (failure != nullptr && !reply.isCutOff) return verdictOn(failure, statement.table);
    if (isRead && reply.isCutOff) continue;
    if (reply.isCutOff || (reply.hasWarning && !isRead)) return verdict(kIoError, kUnknown);
    return take(reply, isRead ? 0 : 1, callback, arg);
  }
  return verdict(kIoError, kCutOff);
}

/// To SQLite a statement that fails leaves the transaction as it was before it,
/// to the server only when it is told beforehand where that was.
Verdict Connection::runWithin(const Statement& statement, RowCallback callback, void* arg) {
  const bool takesLock = statement.kind != Kind::kRead && state_ == State::kOpen;
  Verdict refused;
  std::string text = "SAVEPOINT s;";
  if (takesLock) text += lock(refused) + ";";
  if (refused.code != kOk) return refused;
  if (!server_.isConnected()) state_ = State::kLost;
  if (state_ == State::kLost) return verdict(kIoError, kLostText);

  const Reply reply = ask(text + statement.text + ";RELEASE s");
  if (reply.isCutOff) return verdict(kIoError, kLostText);
  if (const PGresult* const failure = reply.failure(); failure != nullptr) {
    Verdict failed = verdictOn(failure, statement.table);
    if (ask("ROLLBACK TO s;RELEASE s").failure() != nullptr) state_ = State::kLost;
    return failed;
  }
  if (takesLock) state_ = State::kLocked;
  return take(reply, takesLock ? 2 : 1, callback, arg);
}

/// What the opening saw a moment ago need not be created: that would take the
/// lock of all changes with every start.
Verdict Connection::create(const Statement& statement) {
  const std::string name = " " + statement.table + " ";
  if (const std::size_t at = known_.find(name); at != std::string::npos) {
    known_.erase(at, name.size() - 1);
    return {};
  }
  return state_ == State::kNone ? runAlone(statement, nullptr, nullptr)
                                : runWithin(statement, nullptr, nullptr);
}

Verdict Connection::runOne(const Statement& statement, RowCallback callback, void* arg) {
  if (changesTables(statement.kind)) known_.clear();
  switch (statement.kind) {
    case Kind::kBegin:
    case Kind::kBeginImmediate:
      return begin(statement.kind);
    case Kind::kCommit:
      return commit();
    case Kind::kRollback:
      return rollBack();
    case Kind::kPragma:
      return requireKey();
    case Kind::kChanges:
      return giveNumber(changes_, "changes()", callback, arg);
    case Kind::kCreateIfAbsent:
      return create(statement);
    case Kind::kRefused:
      return {kError, statement.text};
    case Kind::kCreate:
    case Kind::kWrite:
    case Kind::kRead:
      break;
  }
  return state_ == State::kNone ? runAlone(statement, callback, arg)
                                : runWithin(statement, callback, arg);
}

Verdict Connection::run(const char* sql, RowCallback callback, void* arg) {
  if (getpid() != owner_) return verdict(kMisuse);
  for (const Statement& statement : statementsOf(sql)) {
    Verdict done = runOne(statement, callback, arg);
    if (done.code != kOk) return done;
  }
  return {};
}

}  // namespace keldoauth::postgresql
