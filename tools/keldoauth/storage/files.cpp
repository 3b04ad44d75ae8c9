#include "tools/keldoauth/storage/files.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>

#include "utils/oauth_names.h"

namespace tool {
namespace {

namespace fs = std::filesystem;

int openFolderOf(const std::string& path) {
  const std::string folder = fs::absolute(path).parent_path();
  return open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
}

Failure taken(const std::string& path) {
  return {kRefused, path + " is there already", "a copy never replaces a file"};
}

/// Media that know no links do know how to rename, and the other way round.
bool moveToFreeName(const std::string& from, const std::string& to) {
  if (renameat2(AT_FDCWD, from.c_str(), AT_FDCWD, to.c_str(), RENAME_NOREPLACE) == 0) return true;
  const bool isUnknown = errno == EINVAL || errno == ENOSYS;
  return isUnknown && link(from.c_str(), to.c_str()) == 0;
}

}  // namespace

Failure systemFailure(const std::string& path) {
  return {kUnavailable, path + ": " + std::strerror(errno)};
}

void requireReadableFile(const std::string& path) {
  const int descriptor = open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
  if (descriptor < 0) throw systemFailure(path);
  struct stat status {};
  const bool isRegular = fstat(descriptor, &status) == 0 && S_ISREG(status.st_mode);
  close(descriptor);
  if (!isRegular) throw Failure(kRefused, path + " is not a regular file");
}

bool isSameFile(const std::string& one, const std::string& other) {
  std::error_code error;
  return fs::equivalent(one, other, error) && !error;
}

void syncFolderOf(const std::string& path) {
  const int folder = openFolderOf(path);
  if (folder < 0) return;
  fsync(folder);
  close(folder);
}

Draft::Draft(const std::string& path) : path_(path), name_(path + ".XXXXXX") {
  if (fs::symlink_status(path).type() != fs::file_type::not_found) throw taken(path);
  const int descriptor = mkostemp(name_.data(), O_CLOEXEC);
  if (descriptor < 0) throw systemFailure(path);
  // The umask may have taken the owner's rights as well. A medium without modes
  // refuses, and keeps its own.
  fchmod(descriptor, S_IRUSR | S_IWUSR);
  close(descriptor);
}

Draft::~Draft() {
  unlink(name_.c_str());
  unlink((name_ + "-journal").c_str());
}

void Draft::publish() const {
  if (!moveToFreeName(name_, path_)) throw errno == EEXIST ? taken(path_) : systemFailure(path_);
  syncFolderOf(path_);
}

MaintenanceLock::MaintenanceLock() : folder_(openFolderOf(KELDOAUTHSERVER::names::kDatabaseFile)) {
  if (folder_ < 0) throw systemFailure(KELDOAUTHSERVER::names::kDatabaseFile);
  if (flock(folder_, LOCK_EX | LOCK_NB) == 0) return;
  close(folder_);
  throw Failure(kRefused, "another restore or rekey is at work", "nothing was changed");
}

MaintenanceLock::~MaintenanceLock() {
  close(folder_);
}

}  // namespace tool
