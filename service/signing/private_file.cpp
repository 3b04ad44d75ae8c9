#include "service/signing/private_file.h"

#include <fcntl.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <utility>

#include "service/signing/key_fault.h"
#include "utils/folder.h"

namespace keldoauth::service::signing {
namespace {

/// What is wrong with the file behind `status`, null for nothing.
const char* faultOf(const struct stat& status) {
  if (!S_ISREG(status.st_mode)) return "is not a regular file";
  const uid_t user = geteuid();
  if (user != 0 && status.st_uid != 0 && status.st_uid != user) return "belongs to another user";
  constexpr mode_t kNobodyElse = S_IXUSR | S_IWGRP | S_IXGRP | S_IRWXO;
  if ((status.st_mode & kNobodyElse) != 0) return "is open to others, or can be executed";
  if (status.st_size > static_cast<off_t>(kMaxKeySetText)) return "is too long";
  return nullptr;
}

void syncFolder(const std::string& path) {
  if (!KELDOAUTHSERVER::syncFolderOf(path)) failByErrno(KELDOAUTHSERVER::folderOf(path));
}

}  // namespace

void fail(const std::string& path, const std::string& reason) {
  throw KeyFault("key file " + path + ": " + reason);
}

void failByErrno(const std::string& path) {
  // What O_NOFOLLOW says of a link would puzzle whoever reads it.
  fail(path, errno == ELOOP ? "is a symbolic link" : std::strerror(errno));
}

int openPrivate(const std::string& path) {
  return open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
}

struct stat checkedStatus(const std::string& path, const Descriptor& file) {
  struct stat status {};
  if (fstat(file.get(), &status) != 0) failByErrno(path);
  if (const char* fault = faultOf(status)) fail(path, fault);
  return status;
}

std::string textIn(const std::string& path, const Descriptor& file) {
  std::string text;
  std::array<char, 4096> piece{};
  for (;;) {
    const ssize_t got =
        pread(file.get(), piece.data(), piece.size(), static_cast<off_t>(text.size()));
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) failByErrno(path);
    if (got == 0) return text;
    text.append(piece.data(), static_cast<std::size_t>(got));
    if (text.size() > kMaxKeySetText) fail(path, "is too long");
  }
}

Draft::Draft(std::string name)
    : name_(std::move(name)),
      file_(open(name_.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0600)) {
  if (!file_.isOpen()) failByErrno(name_);
}

Draft::~Draft() {
  if (!name_.empty()) unlink(name_.c_str());
}

void Draft::write(std::string_view text, const Access& access) const {
  if (fchown(file_.get(), access.owner, access.group) != 0 ||
      fchmod(file_.get(), access.mode) != 0 || !KELDOAUTHSERVER::writeAll(file_.get(), text) ||
      fsync(file_.get()) != 0) {
    failByErrno(name_);
  }
}

void Draft::publishAsNew(const std::string& path) const {
  if (link(name_.c_str(), path.c_str()) != 0) failByErrno(path);
  syncFolder(path);
}

void Draft::publishInPlaceOf(const std::string& path) {
  if (rename(name_.c_str(), path.c_str()) != 0) failByErrno(path);
  name_.clear();
  syncFolder(path);
}

}  // namespace keldoauth::service::signing
