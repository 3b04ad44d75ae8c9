#include "tools/keldoauth/storage/descriptor_vfs.h"

#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <vector>

namespace tool {
namespace {

constexpr char kName[] = "keldoauth-descriptor";

struct File {
  sqlite3_file base;  // first, by SQLite's contract
  int descriptor;
};

int descriptorOf(sqlite3_file* file) {
  return reinterpret_cast<File*>(file)->descriptor;
}

/// Beyond the end of the file all is zero.
int readFile(sqlite3_file* file, void* bytes, int size, sqlite3_int64 at) {
  auto* to = static_cast<char*>(bytes);
  while (size > 0) {
    const ssize_t got =
        pread(descriptorOf(file), to, static_cast<std::size_t>(size), static_cast<off_t>(at));
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return SQLITE_IOERR_READ;
    if (got == 0) {
      std::memset(to, 0, static_cast<std::size_t>(size));
      return SQLITE_IOERR_SHORT_READ;
    }
    to += got;
    at += got;
    size -= static_cast<int>(got);
  }
  return SQLITE_OK;
}

int writeAll(int descriptor, const char* from, std::size_t size, off_t at) {
  while (size > 0) {
    const ssize_t put = pwrite(descriptor, from, size, at);
    if (put < 0 && errno == EINTR) continue;
    if (put < 0) return errno == ENOSPC || errno == EDQUOT ? SQLITE_FULL : SQLITE_IOERR_WRITE;
    from += put;
    at += put;
    size -= static_cast<std::size_t>(put);
  }
  return SQLITE_OK;
}

/// The two bytes of the first page that tell how the file is to be written and
/// read: 1 is by a journal, 2 by a write-ahead log.
int writeFile(sqlite3_file* file, const void* bytes, int size, sqlite3_int64 at) {
  constexpr char kMagic[] = "SQLite format 3";  // its terminator included
  constexpr std::size_t kVersionsAt = 18;
  const auto count = static_cast<std::size_t>(size);
  std::vector<char> page(static_cast<const char*>(bytes), static_cast<const char*>(bytes) + count);
  if (at == 0 && count > kVersionsAt + 1 && std::memcmp(bytes, kMagic, sizeof kMagic) == 0) {
    page.at(kVersionsAt) = page.at(kVersionsAt + 1) = 1;
  }
  return writeAll(descriptorOf(file), page.data(), count, static_cast<off_t>(at));
}

int truncateFile(sqlite3_file* file, sqlite3_int64 size) {
  const bool isDone = ftruncate(descriptorOf(file), static_cast<off_t>(size)) == 0;
  return isDone ? SQLITE_OK : SQLITE_IOERR_TRUNCATE;
}

int sizeOfFile(sqlite3_file* file, sqlite3_int64* size) {
  struct stat status {};
  if (fstat(descriptorOf(file), &status) != 0) return SQLITE_IOERR_FSTAT;
  *size = status.st_size;
  return SQLITE_OK;
}

/// Closing, locking, syncing: whoever owns the descriptor sees to it.
int doNothing(sqlite3_file* /*file*/) {
  return SQLITE_OK;
}
int doNothing(sqlite3_file* /*file*/, int /*unused*/) {
  return SQLITE_OK;
}

int tellOfNoLock(sqlite3_file* /*file*/, int* isReserved) {
  *isReserved = 0;
  return SQLITE_OK;
}

int control(sqlite3_file* /*file*/, int /*operation*/, void* /*argument*/) {
  return SQLITE_NOTFOUND;
}

int sectorSize(sqlite3_file* /*file*/) {
  constexpr int kBytes = 4096;
  return kBytes;
}

int characteristics(sqlite3_file* /*file*/) {
  return 0;
}

sqlite3_io_methods makeMethods() {
  sqlite3_io_methods methods{};
  methods.iVersion = 1;
  methods.xClose = doNothing;
  methods.xRead = readFile;
  methods.xWrite = writeFile;
  methods.xTruncate = truncateFile;
  methods.xSync = doNothing;
  methods.xFileSize = sizeOfFile;
  methods.xLock = doNothing;
  methods.xUnlock = doNothing;
  methods.xCheckReservedLock = tellOfNoLock;
  methods.xFileControl = control;
  methods.xSectorSize = sectorSize;
  methods.xDeviceCharacteristics = characteristics;
  return methods;
}

int openFile(sqlite3_vfs* /*vfs*/, const char* name, sqlite3_file* file, int flags, int* outFlags) {
  static const sqlite3_io_methods methods = makeMethods();
  file->pMethods = nullptr;
  if ((flags & SQLITE_OPEN_MAIN_DB) == 0 || name == nullptr) return SQLITE_CANTOPEN;
  file->pMethods = &methods;
  reinterpret_cast<File*>(file)->descriptor = static_cast<int>(std::strtol(name, nullptr, 10));
  if (outFlags != nullptr) *outFlags = flags;
  return SQLITE_OK;
}

int removeFile(sqlite3_vfs* /*vfs*/, const char* /*name*/, int /*syncFolder*/) {
  return SQLITE_OK;
}

int tellOfNoFile(sqlite3_vfs* /*vfs*/, const char* /*name*/, int /*flags*/, int* isThere) {
  *isThere = 0;
  return SQLITE_OK;
}

int keepName(sqlite3_vfs* /*vfs*/, const char* name, int size, char* full) {
  sqlite3_snprintf(size, full, "%s", name);
  return SQLITE_OK;
}

/// All that is not about files is the system's own.
sqlite3_vfs makeVfs() {
  sqlite3_vfs vfs = *sqlite3_vfs_find(nullptr);
  vfs.szOsFile = sizeof(File);
  vfs.pNext = nullptr;
  vfs.zName = kName;
  vfs.xOpen = openFile;
  vfs.xDelete = removeFile;
  vfs.xAccess = tellOfNoFile;
  vfs.xFullPathname = keepName;
  return vfs;
}

}  // namespace

const char* descriptorVfs() {
  static sqlite3_vfs vfs = makeVfs();
  sqlite3_vfs_register(&vfs, 0);  // again does no harm; if it fails, SQLite knows no such name
  return kName;
}

std::string descriptorName(int descriptor) {
  return std::to_string(descriptor);
}

}  // namespace tool
