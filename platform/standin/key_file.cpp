#include "platform/standin/key_file.h"

#include <fcntl.h>
#include <libgen.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>

namespace keldcore {
namespace {

using PathBuffer = std::array<char, PATH_MAX>;

class Descriptor {
 public:
  explicit Descriptor(int value) : value_(value) {}
  ~Descriptor() {
    if (value_ >= 0) close(value_);
  }
  Descriptor(const Descriptor&) = delete;
  Descriptor& operator=(const Descriptor&) = delete;

  [[nodiscard]] bool isOpen() const { return value_ >= 0; }
  [[nodiscard]] int get() const { return value_; }

 private:
  int value_;
};

/// The one line of a failed call.
bool refuse(const char* path, const char* reason) {
  syslog(LOG_ERR, "keldcore: key file %s: %s", path, reason);
  return false;
}

bool refuse(const char* path, int error) {
  // What O_NOFOLLOW says of a link would puzzle whoever reads the log.
  return refuse(path, error == ELOOP ? "is a symbolic link" : std::strerror(error));
}

/// What is wrong with the file behind `status`, null for nothing.
const char* fault(const struct stat& status) {
  if (!S_ISREG(status.st_mode)) return "is not a regular file";
  if (status.st_uid != geteuid()) return "belongs to another user";
  if ((status.st_mode & (S_IRWXG | S_IRWXO)) != 0) return "is open to group or others";
  if (status.st_size != static_cast<off_t>(sizeof(Key::bytes))) return "is not 64 bytes long";
  return nullptr;
}

bool readAll(int descriptor, Key& key) {
  std::size_t filled = 0;
  while (filled < key.bytes.size()) {
    const ssize_t got = read(descriptor, key.bytes.data() + filled, key.bytes.size() - filled);
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return false;
    filled += static_cast<std::size_t>(got);
  }
  return true;
}

bool writeAll(int descriptor, const Key& key) {
  std::size_t written = 0;
  while (written < key.bytes.size()) {
    const ssize_t put = write(descriptor, key.bytes.data() + written, key.bytes.size() - written);
    if (put < 0 && errno == EINTR) continue;
    if (put < 0) return false;
    written += static_cast<std::size_t>(put);
  }
  return true;
}

/// A private file beside the key's place, under a name that is gone at the end
/// of the scope.
class Draft {
 public:
  explicit Draft(const char* path) : file_(create(path)) {}
  ~Draft() {
    if (file_.isOpen()) unlink(name_.data());
  }
  Draft(const Draft&) = delete;
  Draft& operator=(const Draft&) = delete;

  [[nodiscard]] bool isOpen() const { return file_.isOpen(); }

  /// On the disk, not only in the cache: a name must never appear before the
  /// bytes that it stands for. The mode owes nothing to the umask.
  [[nodiscard]] bool write(const Key& key) const {
    return fchmod(file_.get(), S_IRUSR | S_IWUSR) == 0 && writeAll(file_.get(), key) &&
           fsync(file_.get()) == 0;
  }

  /// Never replaces: of several processes the first one wins, and the others
  /// use its key.
  [[nodiscard]] bool publish(const char* path) const {
    return link(name_.data(), path) == 0 || errno == EEXIST;
  }

 private:
  int create(const char* path) {
    const int length = std::snprintf(name_.data(), name_.size(), "%s.XXXXXX", path);
    if (length < 0 || static_cast<std::size_t>(length) >= name_.size()) {
      errno = ENAMETOOLONG;
      return -1;
    }
    return mkostemp(name_.data(), O_CLOEXEC);
  }

  PathBuffer name_{};
  Descriptor file_;
};

/// A new name survives a power cut only when its folder is synced, too.
bool syncFolderOf(const char* path) {
  PathBuffer copy{};
  std::snprintf(copy.data(), copy.size(), "%s", path);
  const Descriptor folder(open(dirname(copy.data()), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  return folder.isOpen() && fsync(folder.get()) == 0;
}

bool makeKey(const char* path) {
  Key key;
  const Draft draft(path);
  const bool made = draft.isOpen() && getentropy(key.bytes.data(), key.bytes.size()) == 0 &&
                    draft.write(key) && draft.publish(path) && syncFolderOf(path);
  return made || refuse(path, errno);
}

/// The key is no link: its place is where its folder's owner put it. And a pipe
/// in its place must not stop us.
int openKey(const char* path) {
  return open(path, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
}

bool readKey(const char* path, int descriptor, Key& key, FileStamp& stamp) {
  struct stat status {};
  if (fstat(descriptor, &status) != 0) return refuse(path, errno);
  if (const char* reason = fault(status)) return refuse(path, reason);
  if (!readAll(descriptor, key)) return refuse(path, "cannot be read");
  stamp = FileStamp(status);
  return true;
}

}  // namespace

const char* keyFilePath() {
  const char* chosen = secure_getenv("KELDCORE_KEY_FILE");
  return chosen != nullptr && *chosen != '\0' ? chosen : KELDCORE_KEY_FILE;
}

bool loadKey(const char* path, Key& key, FileStamp& stamp) {
  const Descriptor present(openKey(path));
  if (present.isOpen()) return readKey(path, present.get(), key, stamp);
  if (errno != ENOENT) return refuse(path, errno);

  if (!makeKey(path)) return false;
  const Descriptor made(openKey(path));
  return made.isOpen() ? readKey(path, made.get(), key, stamp) : refuse(path, errno);
}

bool isUnchanged(const char* path, const FileStamp& stamp) {
  struct stat status {};
  return lstat(path, &status) == 0 && FileStamp(status) == stamp;
}

}  // namespace keldcore
