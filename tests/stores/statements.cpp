#include "tests/stores/statements.h"

#include <sqlite3.h>

#include <utility>

#include "tests/support/allocations.h"

namespace {

struct State {
  std::vector<std::string> texts;
  std::function<void(const std::string&)> hook;
  bool refusesCommits = false;
  sqlite3* newest = nullptr;
  int waits = 0;
};
State state;

int onStatement(unsigned /*event*/, void* /*unused*/, void* /*statement*/, void* text) {
  const support::Uncounted uncounted;
  const std::string sql = static_cast<const char*>(text);
  if (sql.rfind("--", 0) == 0) return 0;  // a step of a trigger
  state.texts.push_back(sql);
  if (state.hook) state.hook(sql);
  return 0;
}

int onCommit(void* /*unused*/) {
  return state.refusesCommits ? 1 : 0;
}

int onLock(void* /*unused*/, int /*tries*/) {
  ++state.waits;
  return 0;
}

int onAction(void* /*unused*/, int action, const char* operation, const char* /*unused*/,
             const char* /*unused*/, const char* /*unused*/) {
  const bool begins = action == SQLITE_TRANSACTION && std::string(operation) == "BEGIN";
  return begins ? SQLITE_DENY : SQLITE_OK;
}

int onOpen(sqlite3* db, char** /*error*/, const struct sqlite3_api_routines* /*unused*/) {
  state.newest = db;
  sqlite3_trace_v2(db, SQLITE_TRACE_STMT, onStatement, nullptr);
  sqlite3_commit_hook(db, onCommit, nullptr);
  return SQLITE_OK;
}

}  // namespace

/// Where the store is on a server: what the engine in SQLite's place is asked.
extern "C" __attribute__((visibility("default"))) void keldoauth_test_note_statement(
    const char* sql) {
  onStatement(0, nullptr, nullptr, const_cast<char*>(sql));
}

void Statements::watch() {
  state = {};
  sqlite3_auto_extension(reinterpret_cast<void (*)()>(onOpen));
}
void Statements::clear() {
  state.texts.clear();
}
std::vector<std::string> Statements::texts() {
  return state.texts;
}
void Statements::before(std::function<void(const std::string&)> hook) {
  state.hook = std::move(hook);
}
void Statements::refuseCommits(bool refuse) {
  state.refusesCommits = refuse;
}
void Statements::dontWaitForLocks() {
  state.waits = 0;
  if (state.newest != nullptr) sqlite3_busy_handler(state.newest, onLock, nullptr);
}
int Statements::waits() {
  return state.waits;
}
void Statements::refuseBegins() {
  if (state.newest != nullptr) sqlite3_set_authorizer(state.newest, onAction, nullptr);
}
void Statements::limitStatementsTo(int bytes) {
  if (state.newest != nullptr) sqlite3_limit(state.newest, SQLITE_LIMIT_SQL_LENGTH, bytes);
}
void Statements::limitTextsTo(int bytes) {
  if (state.newest != nullptr) sqlite3_limit(state.newest, SQLITE_LIMIT_LENGTH, bytes);
}
