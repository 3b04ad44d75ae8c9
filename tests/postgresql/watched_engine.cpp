// Stands before the library under test, under its name: what SQLite's hooks are
// to the tests of the stores, these are where the store is on a server. It makes
// the server's clock follow the test's, tells the test of each statement, and
// empties the server for the next one.

#include <dlfcn.h>
#include <libpq-fe.h>
#include <sys/time.h>

#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <map>
#include <regex>
#include <string>

struct sqlite3;

namespace {

using RowCallback = int (*)(void*, int, char**, char**);

void* engine() {
  static void* const library = dlopen(ENGINE_UNDER_TEST, RTLD_NOW | RTLD_LOCAL);
  if (library == nullptr) std::fprintf(stderr, "%s\n", dlerror());
  return library;
}

template <typename Function>
Function underTest(const char* name) {
  return reinterpret_cast<Function>(dlsym(engine(), name));
}

/// As the server's owner of the tables, past the library under test.
void tell(const std::string& sql) {
  static PGconn* const connection = PQconnectdb(std::getenv("KELDOAUTH_TEST_SERVER"));
  PGresult* result = PQexec(connection, sql.c_str());
  if (PQresultStatus(result) == PGRES_FATAL_ERROR) {  // a test has made the server hang up
    PQclear(result);
    PQreset(connection);
    result = PQexec(connection, sql.c_str());
  }
  const ExecStatusType status = PQresultStatus(result);
  if (status != PGRES_COMMAND_OK && status != PGRES_TUPLES_OK) {
    std::fprintf(stderr, "%s: %s", sql.c_str(), PQerrorMessage(connection));
    std::abort();
  }
  PQclear(result);
}

/// A test's clock is another than the machine's by more than a statement takes.
void setClock() {
  static std::string told = "NULL";
  timeval test{};
  timespec machine{};
  gettimeofday(&test, nullptr);
  clock_gettime(CLOCK_REALTIME, &machine);
  const bool isStopped = std::labs(static_cast<long>(test.tv_sec - machine.tv_sec)) > 2;
  const std::string now = isStopped ? std::to_string(test.tv_sec) : "NULL";
  if (now == told) return;
  told = now;
  tell("UPDATE keldoauth.test_clock SET seconds=" + now);
}

/// Triggers that tests have made, and the tables that they are on.
std::map<std::string, std::string>& triggers() {
  static std::map<std::string, std::string> all;
  return all;
}

void dropTrigger(const std::string& name) {
  if (triggers().count(name) == 0) return;
  tell("DROP TRIGGER IF EXISTS " + name + " ON keldoauth." + triggers()[name]);
  triggers().erase(name);
}

/// Tests make a change fail by a trigger, in SQLite's words.
bool isTrigger(const std::string& sql) {
  static const std::regex kCreate(
      "CREATE TRIGGER (\\w+) (BEFORE|AFTER) (\\w+) ON (\\w+)(?: WHEN (.*?))? BEGIN "
      "SELECT RAISE\\(((?:ABORT|FAIL), ('\\w+')|IGNORE)\\); END;?");
  static const std::regex kDrop("DROP TRIGGER (\\w+);?");
  std::smatch found;
  if (std::regex_match(sql, found, kDrop)) {
    dropTrigger(found[1]);
    return true;
  }
  if (!std::regex_match(sql, found, kCreate)) return false;
  const std::string name = found[1];
  const std::string body =
      found[7].matched ? "RAISE SQLSTATE '23999' USING MESSAGE = " + found[7].str() : "RETURN NULL";
  triggers()[name] = found[4];
  tell("CREATE OR REPLACE FUNCTION keldoauth.test_" + name +
       "() RETURNS trigger LANGUAGE plpgsql AS $$ BEGIN " + body + "; END $$;CREATE TRIGGER " +
       name + " " + found[2].str() + " " + found[3].str() + " ON keldoauth." + found[4].str() +
       " FOR EACH ROW" + (found[5].matched ? " WHEN (" + found[5].str() + ")" : "") +
       " EXECUTE FUNCTION keldoauth.test_" + name + "()");
  return true;
}

/// Defined by the tests that want to know.
void noteStatement(const char* sql) {
  static const auto note =
      reinterpret_cast<void (*)(const char*)>(dlsym(RTLD_DEFAULT, "keldoauth_test_note_statement"));
  if (note != nullptr) note(sql);
}

}  // namespace

extern "C" {

void keldoauth_test_empty_server() {
  while (!triggers().empty()) dropTrigger(triggers().begin()->first);
  tell("SELECT keldoauth.test_empty()");
}

int sqlite3_open(const char* path, sqlite3** db) {
  return underTest<decltype(&sqlite3_open)>("sqlite3_open")(path, db);
}

int sqlite3_exec(sqlite3* db, const char* sql, RowCallback callback, void* arg, char** text) {
  if (isTrigger(sql)) return 0;
  setClock();
  noteStatement(sql);
  return underTest<decltype(&sqlite3_exec)>("sqlite3_exec")(db, sql, callback, arg, text);
}

int sqlite3_close(sqlite3* db) {
  return underTest<decltype(&sqlite3_close)>("sqlite3_close")(db);
}

int sqlite3_changes(sqlite3* db) {
  return underTest<decltype(&sqlite3_changes)>("sqlite3_changes")(db);
}

int sqlite3_get_autocommit(sqlite3* db) {
  return underTest<decltype(&sqlite3_get_autocommit)>("sqlite3_get_autocommit")(db);
}

int sqlite3_busy_handler(sqlite3* db, int (*handler)(void*, int), void* arg) {
  return underTest<decltype(&sqlite3_busy_handler)>("sqlite3_busy_handler")(db, handler, arg);
}

void sqlite3_free(void* memory) {
  underTest<decltype(&sqlite3_free)>("sqlite3_free")(memory);
}

}  // extern "C"
