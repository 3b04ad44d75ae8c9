// The nine functions of SQLite that the core calls, over a server. Their
// contracts are SQLite's: https://www.sqlite.org/c3ref/funclist.html.

#include <syslog.h>

#include <cstdarg>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <new>
#include <string>

#include "engines/postgresql/connection.h"
#include "engines/postgresql/connection_text.h"
#include "engines/postgresql/result_codes.h"

namespace postgresql = keldoauth::postgresql;

struct sqlite3 : postgresql::Connection {
  using Connection::Connection;
};

namespace {

constexpr char kSource[] = "postgresql";
constexpr int kOpenFailedLine = 10;

char* copied(const std::string& text) {
  auto* const copy = static_cast<char*>(std::malloc(text.size() + 1));
  if (copy != nullptr) std::memcpy(copy, text.c_str(), text.size() + 1);
  return copy;
}

/// The core says that the opening failed, and not why.
int failToOpen(const char* reason) {
  syslog(LOG_ERR, "%s:%d The store is on a server, and cannot be opened[%s]", kSource,
         kOpenFailedLine, reason);
  return postgresql::kCannotOpen;
}

void appendDoubled(std::string& text, const char* value) {
  for (; *value != '\0'; ++value) text.append(*value == '\'' ? 2 : 1, *value);
}

/// "%s", "%q" and "%%": what is asked of it.
std::string formatted(const char* format, std::va_list values) {
  std::string text;
  for (; *format != '\0'; ++format) {
    if (*format != '%') {
      text += *format;
      continue;
    }
    ++format;
    if (*format == '%') text += '%';
    if (*format == 's') text += va_arg(values, const char*);
    if (*format == 'q') appendDoubled(text, va_arg(values, const char*));
    if (*format == '\0') break;
  }
  return text;
}

}  // namespace

extern "C" {

/// `path` leads to the connection text.
int sqlite3_open(const char* path, sqlite3** db) try {
  *db = nullptr;
  auto connection = std::make_unique<sqlite3>(postgresql::readServers(path));
  std::string reason;
  if (!connection->open(reason)) return failToOpen(reason.c_str());
  *db = connection.release();
  return postgresql::kOk;
} catch (const std::bad_alloc&) {
  return postgresql::kNoMemory;
} catch (const std::exception& thrown) {
  return failToOpen(thrown.what());
}

int sqlite3_close(sqlite3* db) {
  delete db;
  return postgresql::kOk;
}

int sqlite3_exec(sqlite3* db, const char* sql, postgresql::RowCallback callback, void* arg,
                 char** text) try {
  if (text != nullptr) *text = nullptr;
  if (db == nullptr || sql == nullptr) return postgresql::kMisuse;
  const postgresql::Verdict verdict = db->run(sql, callback, arg);
  if (verdict.code != postgresql::kOk && text != nullptr) *text = copied(verdict.text);
  return verdict.code;
} catch (const std::exception&) {
  return postgresql::kNoMemory;
}

int sqlite3_changes(sqlite3* db) {
  return db->changes();
}

int sqlite3_get_autocommit(sqlite3* db) {
  return db->isInTransaction() ? 0 : 1;
}

/// The server keeps the time that a lock is waited for.
int sqlite3_busy_handler(sqlite3* /*db*/, int (* /*handler*/)(void*, int), void* /*arg*/) {
  return postgresql::kOk;
}

const char* sqlite3_errstr(int code) {
  return postgresql::standingText(code);
}

char* sqlite3_mprintf(const char* format, ...) {
  std::va_list values;
  va_start(values, format);
  char* text = nullptr;
  try {
    text = copied(formatted(format, values));
  } catch (const std::exception&) {
    text = nullptr;  // as SQLite does without memory
  }
  va_end(values);
  return text;
}

void sqlite3_free(void* memory) {
  std::free(memory);
}

}  // extern "C"
