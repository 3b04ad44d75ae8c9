#include "tests/faults/faulty_vfs.h"

#include <sys/stat.h>
#include <unistd.h>

namespace faults {
namespace {

/// What SQLite takes for its file; the real one lies right behind it.
struct ShimFile {
  sqlite3_file base;
  FaultyVfs* owner;
  const char* path;  // SQLite keeps it while the file is open
  sqlite3_file* real;
  bool folderUnsynced;  // a new journal's entry reaches the medium with its first sync
};

ShimFile& shim(sqlite3_file* file) {
  return *reinterpret_cast<ShimFile*>(file);
}

sqlite3_vfs* plain() {
  return sqlite3_vfs_find(FaultyVfs::kPlain);
}

FaultyVfs& ownerOf(sqlite3_vfs* vfs) {
  return *static_cast<FaultyVfs*>(vfs->pAppData);
}

int permit(ShimFile& file, Call call) {
  return file.owner->medium().permit(call);
}

/// The rest of a call that changes a file: carried out, then reported.
template <typename Report>
int changed(int result, const ShimFile& file, Report report) {
  return result == SQLITE_OK ? report(file.owner->medium(), std::string(file.path)) : result;
}

// Files -----------------------------------------------------------------------

int closeFile(sqlite3_file* file) {
  sqlite3_file* real = shim(file).real;
  return real->pMethods->xClose(real);
}

int readFile(sqlite3_file* file, void* buffer, int size, sqlite3_int64 offset) {
  if (const int error = permit(shim(file), Call::kRead)) return error;
  sqlite3_file* real = shim(file).real;
  return real->pMethods->xRead(real, buffer, size, offset);
}

int writeFile(sqlite3_file* file, const void* data, int size, sqlite3_int64 offset) {
  if (const int error = permit(shim(file), Call::kWrite)) return error;
  sqlite3_file* real = shim(file).real;
  const int result = real->pMethods->xWrite(real, data, size, offset);
  return changed(result, shim(file), [&](Medium& medium, const std::string& path) {
    const auto* bytes = static_cast<const char*>(data);
    return medium.wrote(path, offset, std::string(bytes, static_cast<std::size_t>(size)));
  });
}

int truncateFile(sqlite3_file* file, sqlite3_int64 size) {
  if (const int error = permit(shim(file), Call::kTruncate)) return error;
  sqlite3_file* real = shim(file).real;
  const int result = real->pMethods->xTruncate(real, size);
  return changed(result, shim(file), [&](Medium& medium, const std::string& path) {
    return medium.truncated(path, size);
  });
}

int syncFile(sqlite3_file* file, int flags) {
  if (const int error = permit(shim(file), Call::kSync)) return error;
  sqlite3_file* real = shim(file).real;
  const int result = real->pMethods->xSync(real, flags);
  const bool folder = shim(file).folderUnsynced;
  shim(file).folderUnsynced = false;
  return changed(result, shim(file), [&](Medium& medium, const std::string& path) {
    return medium.synced(path, folder);
  });
}

int fileSize(sqlite3_file* file, sqlite3_int64* size) {
  if (const int error = permit(shim(file), Call::kFileSize)) return error;
  sqlite3_file* real = shim(file).real;
  return real->pMethods->xFileSize(real, size);
}

int lockFile(sqlite3_file* file, int level) {
  if (const int error = permit(shim(file), Call::kLock)) return error;
  sqlite3_file* real = shim(file).real;
  return real->pMethods->xLock(real, level);
}

int unlockFile(sqlite3_file* file, int level) {
  sqlite3_file* real = shim(file).real;
  return real->pMethods->xUnlock(real, level);
}

int checkReservedLock(sqlite3_file* file, int* taken) {
  if (const int error = permit(shim(file), Call::kCheckReservedLock)) return error;
  sqlite3_file* real = shim(file).real;
  return real->pMethods->xCheckReservedLock(real, taken);
}

int controlFile(sqlite3_file* file, int operation, void* argument) {
  sqlite3_file* real = shim(file).real;
  return real->pMethods->xFileControl(real, operation, argument);
}

int sectorSize(sqlite3_file* file) {
  sqlite3_file* real = shim(file).real;
  return real->pMethods->xSectorSize(real);
}

int deviceCharacteristics(sqlite3_file* file) {
  sqlite3_file* real = shim(file).real;
  return real->pMethods->xDeviceCharacteristics(real);
}

/// Version 1: without shared memory and memory mapping, which the library's
/// journal mode never asks for.
constexpr sqlite3_io_methods kMethods = {
    1,
    closeFile,
    readFile,
    writeFile,
    truncateFile,
    syncFile,
    fileSize,
    lockFile,
    unlockFile,
    checkReservedLock,
    controlFile,
    sectorSize,
    deviceCharacteristics,
    nullptr,
    nullptr,
    nullptr,
    nullptr,
    nullptr,
    nullptr,
};

// The file system -------------------------------------------------------------

/// The library makes the database itself, right before SQLite opens it.
bool isNewFile(const char* name, int flags) {
  if (name == nullptr) return false;
  struct stat status {};
  if (stat(name, &status) != 0) return true;
  return (flags & SQLITE_OPEN_MAIN_DB) != 0 && status.st_size == 0;
}

int openFile(sqlite3_vfs* vfs, const char* name, sqlite3_file* file, int flags, int* outFlags) {
  FaultyVfs& owner = ownerOf(vfs);
  ShimFile& opened = shim(file);
  opened.base.pMethods = nullptr;  // SQLite then knows that there is nothing to close
  if (const int error = owner.medium().permit(Call::kOpen)) return error;

  opened.owner = &owner;
  opened.path = name != nullptr ? name : "";
  opened.real = reinterpret_cast<sqlite3_file*>(&opened + 1);
  const bool isNew = isNewFile(name, flags);
  const int result = plain()->xOpen(plain(), name, opened.real, flags, outFlags);
  if (opened.real->pMethods == nullptr) return result;

  opened.base.pMethods = &kMethods;
  opened.folderUnsynced = isNew && (flags & SQLITE_OPEN_MAIN_JOURNAL) != 0;
  owner.noteMode(opened.path);
  if (!isNew || result != SQLITE_OK) return result;
  const int error = owner.medium().created(opened.path);
  if (error != SQLITE_OK) {
    closeFile(file);
    opened.base.pMethods = nullptr;
  }
  return error;
}

int deleteFile(sqlite3_vfs* vfs, const char* path, int syncFolder) {
  Medium& medium = ownerOf(vfs).medium();
  if (const int error = medium.permit(Call::kDelete)) return error;
  const int result = plain()->xDelete(plain(), path, syncFolder);
  return result == SQLITE_OK ? medium.removed(path, syncFolder != 0) : result;
}

int accessFile(sqlite3_vfs* vfs, const char* path, int flags, int* granted) {
  if (const int error = ownerOf(vfs).medium().permit(Call::kAccess)) return error;
  return plain()->xAccess(plain(), path, flags, granted);
}

}  // namespace

int errorOf(Call call) {
  switch (call) {
    case Call::kOpen:
      return SQLITE_CANTOPEN;
    case Call::kRead:
      return SQLITE_IOERR_READ;
    case Call::kWrite:
      return SQLITE_IOERR_WRITE;
    case Call::kSync:
      return SQLITE_IOERR_FSYNC;
    case Call::kTruncate:
      return SQLITE_IOERR_TRUNCATE;
    case Call::kDelete:
      return SQLITE_IOERR_DELETE;
    case Call::kLock:
      return SQLITE_IOERR_LOCK;
    case Call::kAccess:
      return SQLITE_IOERR_ACCESS;
    case Call::kFileSize:
      return SQLITE_IOERR_FSTAT;
    case Call::kCheckReservedLock:
      return SQLITE_IOERR_CHECKRESERVEDLOCK;
  }
  return SQLITE_IOERR;
}

FaultyVfs::FaultyVfs(Medium& medium)
    : medium_(medium), previous_(sqlite3_vfs_find(nullptr)), vfs_(*plain()) {
  vfs_.zName = "faulty";
  vfs_.szOsFile = static_cast<int>(sizeof(ShimFile)) + plain()->szOsFile;
  vfs_.pAppData = this;
  vfs_.xOpen = openFile;
  vfs_.xDelete = deleteFile;
  vfs_.xAccess = accessFile;
  sqlite3_vfs_register(&vfs_, 1);
}

FaultyVfs::~FaultyVfs() {
  sqlite3_vfs_unregister(&vfs_);
  sqlite3_vfs_register(previous_, 1);
}

void FaultyVfs::noteMode(const std::string& path) {
  struct stat status {};
  if (stat(path.c_str(), &status) != 0) return;
  if ((status.st_mode & (S_IRWXG | S_IRWXO)) != 0) exposed_.push_back(path);
}

}  // namespace faults
