#include "platform/standin/key_file.h"

#include <fcntl.h>
#include <libgen.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>

#include "platform/standin/store_file.h"
#include "utils/oauth_names.h"

namespace keldcore {
namespace {

using PathBuffer = std::array<char, PATH_MAX>;

constexpr char kDescriptors[] = "/proc/self/fd";

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

/// `buffer` holds what is returned.
const char* folderOf(const char* path, PathBuffer& buffer) {
  std::snprintf(buffer.data(), buffer.size(), "%s", path);
  return dirname(buffer.data());
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

/// A private file in the key's folder, without a name where the medium knows
/// such files; else its name is gone at the end of the scope.
class Draft {
 public:
  explicit Draft(const char* path) : file_(create(path)) {}
  ~Draft() {
    if (name_[0] != '\0') unlink(name_.data());
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
    std::array<char, 32> own{};
    std::snprintf(own.data(), own.size(), "%s/%d", kDescriptors, file_.get());
    const char* const from = name_[0] != '\0' ? name_.data() : own.data();
    return linkat(AT_FDCWD, from, AT_FDCWD, path, AT_SYMLINK_FOLLOW) == 0 || errno == EEXIST;
  }

 private:
  int create(const char* path) {
    const int nameless = createNameless(path);
    const bool isUnknown = errno == EOPNOTSUPP || errno == EISDIR || errno == EINVAL;
    if (nameless >= 0 || !isUnknown) return nameless;

    const int length = std::snprintf(name_.data(), name_.size(), "%s.draft-XXXXXX", path);
    const bool fits = length >= 0 && static_cast<std::size_t>(length) < name_.size();
    if (!fits) errno = ENAMETOOLONG;
    const int named = fits ? mkostemp(name_.data(), O_CLOEXEC) : -1;
    if (named < 0) name_[0] = '\0';
    return named;
  }

  /// It gets its name by way of /proc, which a jail may lack.
  static int createNameless(const char* path) {
    if (faccessat(AT_FDCWD, kDescriptors, F_OK, 0) != 0) {
      errno = EOPNOTSUPP;
      return -1;
    }
    PathBuffer folder{};
    return open(folderOf(path, folder), O_TMPFILE | O_RDWR | O_CLOEXEC, S_IRUSR | S_IWUSR);
  }

  PathBuffer name_{};  // empty without one
  Descriptor file_;
};

/// A new name survives a power cut only when its folder is synced, too.
bool syncFolderOf(const char* path) {
  PathBuffer buffer{};
  const Descriptor folder(open(folderOf(path, buffer), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  return folder.isOpen() && fsync(folder.get()) == 0;
}

bool makeKey(const char* path) {
  Key key;
  const Draft draft(path);
  const bool made = draft.isOpen() && getentropy(key.bytes.data(), key.bytes.size()) == 0 &&
                    draft.write(key) && draft.publish(path) && syncFolderOf(path);
  return made || refuse(path, errno);
}

/// Why no key may be made now, null when one may.
const char* hindranceToMaking() {
  switch (storedValues(KELDOAUTHSERVER::names::kDatabaseFile)) {
    case StoredValues::kNone:
      return nullptr;
    case StoredValues::kSome:
      return "is missing, and the store has values that it encrypted";
    default:
      return "is missing, and whether the store has values that it encrypted cannot be seen";
  }
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

bool loadKey(const char* path, WhenAbsent whenAbsent, Key& key, FileStamp& stamp) {
  const Descriptor present(openKey(path));
  if (present.isOpen()) return readKey(path, present.get(), key, stamp);
  if (errno != ENOENT) return refuse(path, errno);
  if (whenAbsent == WhenAbsent::kFail) return refuse(path, "is missing");

  const char* const hindrance = hindranceToMaking();
  if (hindrance == nullptr && !makeKey(path)) return false;
  // Also where it may not be made: another process may have made it and stored
  // the values that we saw.
  const Descriptor made(openKey(path));
  if (made.isOpen()) return readKey(path, made.get(), key, stamp);
  return hindrance != nullptr ? refuse(path, hindrance) : refuse(path, errno);
}

bool isUnchanged(const char* path, const FileStamp& stamp) {
  struct stat status {};
  return lstat(path, &status) == 0 && FileStamp(status) == stamp;
}

}  // namespace keldcore
