#include "engines/choice/engine_calls.h"

#include <dlfcn.h>
#include <syslog.h>

#include <algorithm>
#include <mutex>
#include <new>
#include <vector>

#include "engines/choice/choice.h"
#include "utils/wide_time.h"

namespace {

namespace engines = KELDOAUTHSERVER::engines;

constexpr char kSource[] = "engine";
constexpr int kNoLibraryLine = 10;

/// The library in SQLite's place, once it is loaded; it stays.
struct ServerEngine {
  decltype(&sqlite3_open) open = nullptr;
  decltype(&sqlite3_close) close = nullptr;
  decltype(&sqlite3_exec) exec = nullptr;
  decltype(&sqlite3_changes) changes = nullptr;
  decltype(&sqlite3_get_autocommit) getAutocommit = nullptr;
  decltype(&sqlite3_busy_handler) busyHandler = nullptr;
  decltype(&sqlite3_free) free = nullptr;
  bool isThere = false;

  template <typename Function>
  bool find(void* library, const char* name, Function& function) {
    function = reinterpret_cast<Function>(dlsym(library, name));
    return function != nullptr;
  }

  ServerEngine() {
    // Its functions have SQLite's names: nobody else is to find them.
    void* const library = dlopen(engines::kServerLibrary, RTLD_NOW | RTLD_LOCAL);
    isThere = library != nullptr && find(library, "sqlite3_open", open) &&
              find(library, "sqlite3_close", close) && find(library, "sqlite3_exec", exec) &&
              find(library, "sqlite3_changes", changes) &&
              find(library, "sqlite3_get_autocommit", getAutocommit) &&
              find(library, "sqlite3_busy_handler", busyHandler) &&
              find(library, "sqlite3_free", free);
    if (isThere) return;
    syslog(LOG_ERR, "%s:%d The store is on a server, and its library cannot be loaded[%s]", kSource,
           kNoLibraryLine, engines::kServerLibrary);
  }
};

const ServerEngine& serverEngine() {
  static const ServerEngine engine;
  return engine;
}

/// The connections that are the server engine's. Nothing about a handle itself
/// says whose it is.
class Handles {
 public:
  void add(sqlite3* db) {
    const std::lock_guard<std::mutex> guard(mutex_);
    handles_.push_back(db);
  }

  bool remove(sqlite3* db) {
    const std::lock_guard<std::mutex> guard(mutex_);
    const auto found = std::find(handles_.begin(), handles_.end(), db);
    if (found == handles_.end()) return false;
    handles_.erase(found);
    return true;
  }

  bool has(sqlite3* db) {
    const std::lock_guard<std::mutex> guard(mutex_);
    return std::find(handles_.begin(), handles_.end(), db) != handles_.end();
  }

 private:
  std::mutex mutex_;
  std::vector<sqlite3*> handles_;
};

/// Never destroyed: a store may be, after it.
Handles& onServer() {
  static Handles& handles = *new Handles;
  return handles;
}

}  // namespace

extern "C" {

int keldoauth_engine_open(const char* path, sqlite3** db) {
  if (!engines::isOnServer(path)) return sqlite3_open(path, db);
  const ServerEngine& engine = serverEngine();
  if (!engine.isThere) return SQLITE_CANTOPEN;
  const int result = engine.open(path, db);
  if (*db == nullptr) return result;
  try {
    onServer().add(*db);
  } catch (const std::bad_alloc&) {
    engine.close(*db);
    *db = nullptr;
    return SQLITE_NOMEM;
  }
  return result;
}

int keldoauth_engine_close(sqlite3* db) {
  return onServer().remove(db) ? serverEngine().close(db) : sqlite3_close(db);
}

int keldoauth_engine_exec(sqlite3* db, const char* sql, sqlite3_callback callback, void* arg,
                          char** text) {
  if (!onServer().has(db)) return sqlite3_exec(db, sql, callback, arg, text);
  char* reason = nullptr;
  const int result = serverEngine().exec(db, sql, callback, arg, &reason);
  // Whoever gets the text frees it with SQLite's function.
  if (text != nullptr) *text = reason != nullptr ? sqlite3_mprintf("%s", reason) : nullptr;
  serverEngine().free(reason);
  return result;
}

int keldoauth_engine_changes(sqlite3* db) {
  return onServer().has(db) ? serverEngine().changes(db) : sqlite3_changes(db);
}

int keldoauth_engine_get_autocommit(sqlite3* db) {
  return onServer().has(db) ? serverEngine().getAutocommit(db) : sqlite3_get_autocommit(db);
}

int keldoauth_engine_busy_handler(sqlite3* db, int (*handler)(void*, int), void* arg) {
  return onServer().has(db) ? serverEngine().busyHandler(db, handler, arg)
                            : sqlite3_busy_handler(db, handler, arg);
}

}  // extern "C"
