// Stands before libsqlcipher at link time: every connection gets its key as soon
// as it is open, whoever opens it. The key is no secret here; a product would
// ask its platform for one. And as an operator has to, it puts a key of the
// stand-in cipher, which sees nothing in an encrypted file, beside a new store.

#define SQLITE_HAS_CODEC
#include <dlfcn.h>
#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cstring>
#include <string>

#include "utils/oauth_names.h"

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

/// A store that others have filled belongs to the key that it has, or has lost.
bool isNewStore(const char* path) {
  struct stat status {};
  return std::strcmp(path, KELDOAUTHSERVER::names::kDatabaseFile) == 0 &&
         (stat(path, &status) != 0 || status.st_size == 0);
}

/// Whole or not at all, and never in the place of another.
void putKeyBeside(const std::string& store) {
  const std::string folder = store.substr(0, store.rfind('/'));
  std::array<char, 64> bytes{};
  const int file = open(folder.c_str(), O_TMPFILE | O_WRONLY | O_CLOEXEC, S_IRUSR | S_IWUSR);
  if (file < 0) return;
  if (getentropy(bytes.data(), bytes.size()) == 0 &&
      write(file, bytes.data(), bytes.size()) == static_cast<ssize_t>(bytes.size())) {
    linkat(AT_FDCWD, ("/proc/self/fd/" + std::to_string(file)).c_str(), AT_FDCWD,
           (folder + "/keldcore.key").c_str(), AT_SYMLINK_FOLLOW);
  }
  close(file);
}

}  // namespace

extern "C" {

int sqlite3_open(const char* path, sqlite3** db) {
  static const auto open = next<decltype(&sqlite3_open)>("sqlite3_open");
  if (isNewStore(path)) putKeyBeside(path);
  const int result = open(path, db);
  return withKey(result, *db);
}

int sqlite3_open_v2(const char* path, sqlite3** db, int flags, const char* vfs) {
  static const auto open = next<decltype(&sqlite3_open_v2)>("sqlite3_open_v2");
  if (isNewStore(path)) putKeyBeside(path);
  const int result = open(path, db, flags, vfs);
  return withKey(result, *db);
}

}  // extern "C"
