/* The same process as process_library, in C over bare SQLite: the statements
 * that the library sends, the same wait for locks, no cipher and no JSON. */

#include <sqlite3.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <time.h>
#include <unistd.h>

static const char kFile[] = "/var/packages/Corvane/target/etc/oauth.db";

/* "issue-full" leaves out the first one, and syncs what SQLite syncs by default.
 * "verify-alone" leaves out all of them: what they cost. */
static const char* const kStartUp[] = {
    "PRAGMA synchronous=EXTRA;",
    "SELECT * FROM sqlite_master WHERE name='oauth_meta' and type='table';",
    "CREATE TABLE IF NOT EXISTS oauth_clientInfo(enable text NOT NULL, client_id text NOT NULL "
    "UNIQUE, client_secret text NOT NULL, redirect_uri text NOT NULL, scope text NOT NULL, "
    "display_name text NOT NULL, id integer PRIMARY KEY);",
    "CREATE TABLE IF NOT EXISTS oauth_token(username text NOT NULL,  client_id text NOT NULL,  "
    "scope text NOT NULL,  refresh_token text NOT NULL, access_token text NOT NULL UNIQUE, "
    "expired_time text NOT NULL, flow_type text NOT NULL, state text NOT NULL, ip text NOT NULL "
    "DEFAULT 'None', id integer PRIMARY KEY);",
    "CREATE TABLE IF NOT EXISTS oauth_grantCode(username text NOT NULL, client_id text NOT NULL, "
    "scope text NOT NULL, code text NOT NULL UNIQUE, expired_time text NOT NULL, state text NOT "
    "NULL, ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY);",
    "CREATE TABLE IF NOT EXISTS oauth_log(timestamp integer NOT NULL, msg text NOT NULL, id "
    "integer PRIMARY KEY);"};
static const size_t kStatements = sizeof kStartUp / sizeof *kStartUp;

static size_t first_statement(const char* verb) {
  if (strcmp(verb, "verify-alone") == 0) return kStatements;
  return strcmp(verb, "issue-full") == 0 ? 1 : 0;
}

struct wait_for_lock {
  long long since_ms;
};

static long long now_ms(void) {
  struct timespec now;
  clock_gettime(CLOCK_MONOTONIC, &now);
  return (long long)now.tv_sec * 1000 + now.tv_nsec / 1000000;
}

static int wait_step(void* arg, int waits) {
  struct wait_for_lock* wait = arg;
  const struct timespec step = {0, 1000000};
  if (waits == 0) wait->since_ms = now_ms();
  if (now_ms() - wait->since_ms >= 5000) return 0;
  nanosleep(&step, NULL);
  return 1;
}

static int found;

static int row(void* arg, int count, char** values, char** columns) {
  (void)arg, (void)count, (void)values, (void)columns;
  found = 1;
  return 0;
}

static int verify(sqlite3* db, const char* token) {
  char sql[256];
  snprintf(sql, sizeof sql, "SELECT * FROM oauth_token WHERE access_token='%.64s' ;", token);
  return sqlite3_exec(db, sql, row, NULL, NULL) == SQLITE_OK && found ? 0 : 1;
}

static int purge(sqlite3* db) {
  return sqlite3_exec(db, "DELETE FROM oauth_token WHERE CAST(expired_time AS INTEGER) < 2000;",
                      NULL, NULL, NULL) == SQLITE_OK
             ? 0
             : 1;
}

static int issue(sqlite3* db, int count) {
  char sql[1024];
  for (int i = 0; i < count; ++i) {
    char token[65];
    snprintf(token, sizeof token, "%032d%032d", (int)getpid(), i);
    snprintf(sql, sizeof sql,
             "INSERT INTO oauth_token (access_token, client_id, expired_time, flow_type, id, ip, "
             "refresh_token, scope, state, username) VALUES('%s', '%0107d', '4102444800', "
             "'authorization_code', NULL, '192.0.2.7', '%s', 'photos.read', 'af0ifjsldkj', "
             "'alice');",
             token, 1, token);
    if (sqlite3_exec(db, "SELECT COUNT(*) FROM oauth_token;", row, NULL, NULL) != SQLITE_OK ||
        sqlite3_exec(db, sql, NULL, NULL, NULL) != SQLITE_OK) {
      return 1;
    }
  }
  return 0;
}

int main(int argc, char** argv) {
  sqlite3* db = NULL;
  struct wait_for_lock wait = {0};
  if (argc != 3 || sqlite3_open(kFile, &db) != SQLITE_OK) return 2;
  sqlite3_busy_handler(db, wait_step, &wait);
  for (size_t i = first_statement(argv[1]); i < kStatements; ++i) {
    if (sqlite3_exec(db, kStartUp[i], NULL, NULL, NULL) != SQLITE_OK) return 2;
  }
  const int result = strncmp(argv[1], "verify", 6) == 0 ? verify(db, argv[2])
                     : strcmp(argv[1], "purge") == 0    ? purge(db)
                                                        : issue(db, atoi(argv[2]));
  sqlite3_close(db);
  return result;
}
