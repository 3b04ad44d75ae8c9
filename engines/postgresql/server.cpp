#include "engines/postgresql/server.h"

#include <chrono>
#include <cstddef>
#include <cstring>
#include <utility>

#include "engines/postgresql/deadline.h"
#include "engines/postgresql/result_codes.h"

namespace keldoauth::postgresql {
namespace {

using std::chrono::milliseconds;

/// How soon a standby is asked again whether it has become the primary.
constexpr milliseconds kPause{50};
constexpr milliseconds kForever{1000 * 60 * 60};

/// All that a new connection has to know, in one round.
constexpr char kOpening[] =
    "SELECT pg_is_in_recovery() OR current_setting('transaction_read_only')='on',"
    "current_setting('server_encoding')='SQL_ASCII' AND "
    "current_setting('standard_conforming_strings')='on',"
    "(SELECT client_id FROM keldoauth.oauth_key),"
    "(SELECT ' '||string_agg(name,' ')||' ' FROM keldoauth.sqlite_master)";
enum Column : int { kIsStandby, kIsSuitable, kSeal, kTables, kColumns };

/// A warning that comes with a commit means that it was not waited for; what
/// comes to a connection at rest is a farewell.
void noteNotice(void* hasWarning, const PGresult* notice) {
  const char* const severity = PQresultErrorField(notice, PG_DIAG_SEVERITY_NONLOCALIZED);
  for (const char* const noted : {"WARNING", "FATAL", "PANIC"}) {
    if (severity != nullptr && std::strcmp(severity, noted) == 0) {
      *static_cast<bool*>(hasWarning) = true;
    }
  }
}

short eventsFor(PostgresPollingStatusType status) {
  return status == PGRES_POLLING_WRITING ? POLLOUT : POLLIN;
}

}  // namespace

// Connecting ------------------------------------------------------------------------

/// One server on its way from the first packet to the answer of the opening.
class Attempt {
 public:
  enum class State { kConnecting, kAsking, kStandby, kFailed, kDone };

  explicit Attempt(const Options& options) : options_(options) { start(); }

  void start() {
    std::vector<const char*> keywords;
    std::vector<const char*> values;
    for (const auto& [keyword, value] : options_) {
      keywords.push_back(keyword.c_str());
      values.push_back(value.c_str());
    }
    keywords.push_back(nullptr);
    values.push_back(nullptr);
    state_ = State::kConnecting;
    status_ = PGRES_POLLING_WRITING;
    connection_.reset(PQconnectStartParams(keywords.data(), values.data(), 0));
    if (PQstatus(connection_.get()) == CONNECTION_BAD) fail(PQerrorMessage(connection_.get()));
    PQsetNoticeReceiver(connection_.get(), noteNotice, &ignored_);
  }

  [[nodiscard]] State state() const { return state_; }
  [[nodiscard]] bool isWaiting() const {
    return state_ == State::kConnecting || state_ == State::kAsking;
  }
  [[nodiscard]] const std::string& reason() const { return reason_; }
  [[nodiscard]] pollfd socket() const {
    return {PQsocket(connection_.get()), eventsFor(status_), 0};
  }

  void goOn() {
    if (state_ == State::kConnecting) return goOnConnecting();
    if (PQconsumeInput(connection_.get()) == 0) return fail(PQerrorMessage(connection_.get()));
    while (state_ == State::kAsking && PQisBusy(connection_.get()) == 0) {
      const Result result(PQgetResult(connection_.get()));
      if (result != nullptr) {
        read(result.get());
      } else {
        state_ = State::kDone;
      }
    }
  }

  /// Once done.
  std::unique_ptr<PGconn, FinishConnection> connection() { return std::move(connection_); }
  std::string seal, tables;

 private:
  void fail(const char* reason) {
    state_ = wasStandby_ ? State::kStandby : State::kFailed;
    reason_ = trimmed(reason);
  }

  void goOnConnecting() {
    status_ = PQconnectPoll(connection_.get());
    if (status_ == PGRES_POLLING_FAILED) return fail(PQerrorMessage(connection_.get()));
    if (status_ != PGRES_POLLING_OK) return;
    state_ = State::kAsking;
    status_ = PGRES_POLLING_READING;
    if (PQsendQuery(connection_.get(), kOpening) == 0) fail(PQerrorMessage(connection_.get()));
  }

  void read(const PGresult* result) {
    if (PQresultStatus(result) != PGRES_TUPLES_OK || PQnfields(result) != kColumns) {
      return fail("the server was not prepared, or not for this user: see keldoauth.sql");
    }
    const auto value = [&](Column column) { return PQgetvalue(result, 0, column); };
    if (*value(kIsStandby) == 't') {
      wasStandby_ = true;
      return fail("the server is a standby");
    }
    if (*value(kIsSuitable) != 't') return fail("the database changes bytes: see keldoauth.sql");
    seal = value(kSeal);
    tables = value(kTables);
  }

  const Options& options_;
  std::unique_ptr<PGconn, FinishConnection> connection_;
  PostgresPollingStatusType status_ = PGRES_POLLING_WRITING;
  State state_ = State::kConnecting;
  std::string reason_;
  bool wasStandby_ = false;
  bool ignored_ = false;
};

bool Server::connect(const Servers& servers, std::string& reason) {
  const Deadline deadline(kConnectingSeconds);
  disconnect();
  std::vector<std::unique_ptr<Attempt>> attempts;
  for (const Options& options : servers) attempts.push_back(std::make_unique<Attempt>(options));

  while (!deadline.isOver()) {
    std::vector<pollfd> sockets;
    bool hasStandby = false;
    for (const auto& attempt : attempts) {
      if (attempt->isWaiting()) sockets.push_back(attempt->socket());
      hasStandby = hasStandby || attempt->state() == Attempt::State::kStandby;
    }
    if (sockets.empty() && !hasStandby) break;
    const bool isReady = deadline.wait(sockets, hasStandby ? kPause : kForever);

    std::size_t at = 0;
    for (const auto& attempt : attempts) {
      if (attempt->state() == Attempt::State::kStandby && !isReady) {
        attempt->start();
      } else if (attempt->isWaiting() && at < sockets.size() && sockets[at++].revents != 0) {
        attempt->goOn();
      }
      if (attempt->state() != Attempt::State::kDone) continue;
      connection_ = attempt->connection();
      saidFarewell_ = false;
      PQsetNoticeReceiver(connection_.get(), noteNotice, &saidFarewell_);
      seal_ = attempt->seal;
      tables_ = attempt->tables;
      return true;
    }
  }
  for (const auto& attempt : attempts) {
    reason += (reason.empty() ? "" : "; ") +
              (attempt->isWaiting() ? "the server does not answer" : attempt->reason());
  }
  return false;
}

// Talking ---------------------------------------------------------------------------

const PGresult* Reply::failure() const {
  for (const Result& result : results) {
    const ExecStatusType status = PQresultStatus(result.get());
    if (status != PGRES_COMMAND_OK && status != PGRES_TUPLES_OK && status != PGRES_EMPTY_QUERY) {
      return result.get();
    }
  }
  return nullptr;
}

bool Server::isConnected() {
  if (connection_ == nullptr) return false;
  // The farewell may be here before the end of the connection is.
  const bool isThere = PQconsumeInput(connection_.get()) == 1;
  const bool isIdle = isThere && PQisBusy(connection_.get()) == 0;
  if (!isIdle || saidFarewell_ || PQstatus(connection_.get()) != CONNECTION_OK) disconnect();
  return connection_ != nullptr;
}

Reply Server::ask(const std::string& text) {
  Reply reply;
  PGconn* const connection = connection_.get();
  const Deadline deadline(kAnswerSeconds);
  PQsetNoticeReceiver(connection, noteNotice, &reply.hasWarning);
  bool isGood = PQsetnonblocking(connection, 1) == 0 && PQsendQuery(connection, text.c_str()) == 1;
  while (isGood) {
    const int unsent = PQflush(connection);
    if (unsent == 0 && PQisBusy(connection) == 0) {
      Result result(PQgetResult(connection));
      if (result == nullptr) break;
      reply.results.push_back(std::move(result));
      continue;
    }
    std::vector<pollfd> sockets{
        {PQsocket(connection), static_cast<short>(unsent != 0 ? POLLIN | POLLOUT : POLLIN), 0}};
    const bool isReady = deadline.wait(sockets, kForever);
    isGood = unsent >= 0 && (isReady ? PQconsumeInput(connection) == 1 : !deadline.isOver());
  }
  PQsetNoticeReceiver(connection, noteNotice, &saidFarewell_);
  reply.isCutOff = !isGood || PQstatus(connection) != CONNECTION_OK;
  if (reply.isCutOff) disconnect();
  return reply;
}

}  // namespace keldoauth::postgresql
