// Stands before libsqlcipher at link time: every connection gets its key as soon
// as it is open, whoever opens it. The key is no secret here; a product would
// ask its platform for one.

#define SQLITE_HAS_CODEC
#include <dlfcn.h>
#include <sqlite3.h>

#include <array>

namespace {

// 64 hexadecimal digits in x'' are the key itself: nothing is derived from them,
// which would take a tenth of a second with each connection.
constexpr std::array<char, 68> kRawKey{
    "x'2DD29CA851E7B56E4697B0E1F08507293D761A05CE4D1B628663F411A8086D99'"};

template <typename Function>
Function next(const char* name) {
  return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

/// Past what a test may have put in the place of sqlite3_exec.
int run(sqlite3* db, const char* sql) {
  static const auto exec = reinterpret_cast<decltype(&sqlite3_exec)>(
      dlsym(dlopen("libsqlcipher.so.0", RTLD_LAZY | RTLD_NOLOAD), "sqlite3_exec"));
  return exec(db, sql, nullptr, nullptr, nullptr);
}

/// Pages as large as those of today's SQLite.
int withKey(int result, sqlite3* db) {
  if (result != SQLITE_OK) return result;
  const int keyed = sqlite3_key(db, kRawKey.data(), static_cast<int>(kRawKey.size() - 1));
  return keyed == SQLITE_OK ? run(db, "PRAGMA cipher_page_size = 4096") : keyed;
}

}  // namespace

extern "C" {

int sqlite3_open(const char* path, sqlite3** db) {
  static const auto open = next<decltype(&sqlite3_open)>("sqlite3_open");
  const int result = open(path, db);
  return withKey(result, *db);
}

int sqlite3_open_v2(const char* path, sqlite3** db, int flags, const char* vfs) {
  static const auto open = next<decltype(&sqlite3_open_v2)>("sqlite3_open_v2");
  const int result = open(path, db, flags, vfs);
  return withKey(result, *db);
}

}  // extern "C"
