#include "tools/keldoauth/storage/files.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>

#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace tool {
namespace {

namespace fs = std::filesystem;

constexpr char kDescriptors[] = "/proc/self/fd";

int openFolderOf(const std::string& path) {
  const std::string folder = fs::absolute(path).parent_path();
  return open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
}

Failure taken(const std::string& path) {
  return {kRefused, path + " is there already", "a copy never replaces a file"};
}

/// Not every C library has a function for it.
bool renameToFreeName(int folder, const std::string& from, const std::string& to) {
  constexpr unsigned int kNoReplace = 1;
  return syscall(SYS_renameat2, folder, from.c_str(), folder, to.c_str(), kNoReplace) == 0;
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
  const Descriptor folder(openFolderOf(path));
  if (folder.isOpen() && fsync(folder.get()) == 0) return;
  throw systemFailure(fs::absolute(path).parent_path());
}

// Drafts ----------------------------------------------------------------------------

Draft::Draft(const std::string& path)
    : path_(path), base_(fs::path(path).filename()), folder_(openFolderOf(path)), file_(create()) {
  // The umask may have taken the owner's rights as well. A medium without modes
  // refuses, and keeps its own.
  fchmod(file_.get(), S_IRUSR | S_IWUSR);
}

/// Throws Failure.
int Draft::create() {
  constexpr unsigned int kSuffixLength = 6;
  if (!folder_.isOpen()) throw systemFailure(path_);
  if (base_.empty()) base_ = ".";
  struct stat status {};
  if (fstatat(folder_.get(), base_.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0) throw taken(path_);

  // Without /proc it could not get a name later on.
  const bool canBeNamed = faccessat(AT_FDCWD, kDescriptors, F_OK, 0) == 0;
  int file = canBeNamed ? openat(folder_.get(), ".", O_TMPFILE | O_RDWR | O_CLOEXEC, 0600) : -1;
  if (!canBeNamed || (file < 0 && (errno == EOPNOTSUPP || errno == EISDIR || errno == EINVAL))) {
    draftName_ = base_ + "." + KELDOAUTHSERVER::getRandomStr(kSuffixLength);
    file = openat(folder_.get(), draftName_.c_str(),
                  O_CREAT | O_EXCL | O_NOFOLLOW | O_RDWR | O_CLOEXEC, 0600);
    if (file < 0) draftName_.clear();
  }
  if (file < 0) throw systemFailure(path_);
  return file;
}

Draft::~Draft() {
  if (!draftName_.empty()) unlinkat(folder_.get(), draftName_.c_str(), 0);
}

std::uintmax_t Draft::size() const {
  struct stat status {};
  if (fstat(file_.get(), &status) != 0) throw systemFailure(path_);
  return static_cast<std::uintmax_t>(status.st_size);
}

void Draft::publish() {
  if (fsync(file_.get()) != 0) throw systemFailure(path_);
  if (!moveToFreeName()) throw errno == EEXIST ? taken(path_) : systemFailure(path_);
  if (!isInPlace()) {
    throw Failure(kUnavailable, path_ + " is another file now: somebody put it there",
                  "write to a folder that nobody else may write");
  }
  if (fsync(folder_.get()) == 0) return;
  const std::string reason = std::strerror(errno);
  throw Failure(kUnavailable, path_ + " is whole, but its folder cannot be synced: " + reason,
                "a power cut may take the name away again");
}

/// Media that know no links do know how to rename, and the other way round.
bool Draft::moveToFreeName() const {
  const int folder = folder_.get();
  if (draftName_.empty()) {
    const std::string own = kDescriptors + ("/" + std::to_string(file_.get()));
    return linkat(AT_FDCWD, own.c_str(), folder, base_.c_str(), AT_SYMLINK_FOLLOW) == 0;
  }
  if (renameToFreeName(folder, draftName_, base_)) return true;
  const bool isUnknown = errno == EINVAL || errno == ENOSYS;
  return isUnknown && linkat(folder, draftName_.c_str(), folder, base_.c_str(), 0) == 0;
}

/// A draft with a name may have been replaced.
bool Draft::isInPlace() const {
  struct stat own {};
  struct stat named {};
  return fstat(file_.get(), &own) == 0 &&
         fstatat(folder_.get(), base_.c_str(), &named, AT_SYMLINK_NOFOLLOW) == 0 &&
         own.st_dev == named.st_dev && own.st_ino == named.st_ino;
}

MaintenanceLock::MaintenanceLock() : folder_(openFolderOf(KELDOAUTHSERVER::names::kDatabaseFile)) {
  if (!folder_.isOpen()) throw systemFailure(KELDOAUTHSERVER::names::kDatabaseFile);
  if (flock(folder_.get(), LOCK_EX | LOCK_NB) == 0) return;
  throw Failure(kRefused, "another restore or rekey is at work", "nothing was changed");
}

}  // namespace tool
