#include "service/signing/key_file.h"

#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdint>
#include <optional>

#include "service/signing/key_fault.h"
#include "service/signing/private_file.h"
#include "service/signing/random.h"
#include "service/text/encoding.h"

namespace keldoauth::service::signing {
namespace {

/// What a process that was killed has left under it was never anybody's keys.
std::string freshName(const std::string& path) {
  Random random;
  std::array<std::uint8_t, 9> bytes{};
  Random::fill(&random, bytes.size(), bytes.data());
  return path + ".draft-" + base64Url({reinterpret_cast<const char*>(bytes.data()), bytes.size()});
}

KeySet readKeys(const std::string& path, const Descriptor& file) {
  const std::string text = textIn(path, file);
  try {
    return KeySet::read(text);
  } catch (const KeyFault& fault) {
    fail(path, fault.what());
  }
}

bool isAtPath(const std::string& path, const struct stat& status) {
  struct stat present {};
  return lstat(path.c_str(), &present) == 0 && present.st_dev == status.st_dev &&
         present.st_ino == status.st_ino;
}

/// Holds the file that stands at the path; others that want to change it wait.
class LockedFile {
 public:
  /// Whoever held the lock before has put another file in the place of the one
  /// that we waited for.
  explicit LockedFile(const std::string& path) {
    do {
      file_.emplace(openPrivate(path));
      if (!file_->isOpen()) failByErrno(path);
      status_ = checkedStatus(path, *file_);
      while (flock(file_->get(), LOCK_EX) != 0) {
        if (errno != EINTR) failByErrno(path);
      }
    } while (!isAtPath(path, status_));
  }

  [[nodiscard]] const Descriptor& file() const { return *file_; }
  [[nodiscard]] Access access() const {
    return {status_.st_uid, status_.st_gid, status_.st_mode & 07777};
  }

 private:
  std::optional<Descriptor> file_;
  struct stat status_ {};
};

}  // namespace

KeySet KeyFile::read() const {
  const Descriptor file(openPrivate(path_));
  if (!file.isOpen()) failByErrno(path_);
  checkedStatus(path_, file);
  return readKeys(path_, file);
}

void KeyFile::create(const KeySet& keys, const Access& access) const {
  const Draft draft(freshName(path_));
  draft.write(keys.text(), access);
  draft.publishAsNew(path_);
}

void KeyFile::update(const std::function<void(KeySet&)>& change) const {
  const LockedFile locked(path_);
  KeySet keys = readKeys(path_, locked.file());
  const std::string before = keys.text();
  change(keys);
  const std::string after = keys.text();
  if (after == before) return;
  static_cast<void>(KeySet::read(after));  // what nobody could read must not be written

  // One of a process that was killed; nobody else is at work here.
  const std::string name = path_ + ".draft";
  if (unlink(name.c_str()) != 0 && errno != ENOENT) failByErrno(name);
  Draft draft(name);
  draft.write(after, locked.access());
  draft.publishInPlaceOf(path_);
}

}  // namespace keldoauth::service::signing
