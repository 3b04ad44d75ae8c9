#include "platform/standin/key_file.h"

#include <fcntl.h>
#include <linux/limits.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace keldcore {
namespace {

/// A descriptor that closes itself.
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

bool refuse(const char* path, const char* reason) {
  syslog(LOG_ERR, "keldcore: key file %s: %s", path, reason);
  return false;
}

/// What is wrong with the file behind `status`, null for nothing.
const char* fault(const struct stat& status) {
  if (!S_ISREG(status.st_mode)) return "not a regular file";
  if (status.st_uid != geteuid()) return "belongs to another user";
  if ((status.st_mode & (S_IRWXG | S_IRWXO)) != 0) return "open to group or others";
  if (status.st_size != static_cast<off_t>(Key().size())) return "not 64 bytes long";
  return nullptr;
}

bool readAll(int descriptor, Key& key) {
  std::size_t filled = 0;
  while (filled < key.size()) {
    const ssize_t got = read(descriptor, key.data() + filled, key.size() - filled);
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return false;
    filled += static_cast<std::size_t>(got);
  }
  return true;
}

bool writeAll(int descriptor, const Key& key) {
  std::size_t written = 0;
  while (written < key.size()) {
    const ssize_t put = write(descriptor, key.data() + written, key.size() - written);
    if (put < 0 && errno == EINTR) continue;
    if (put <= 0) return false;
    written += static_cast<std::size_t>(put);
  }
  return fsync(descriptor) == 0;
}

bool fillRandom(Key& key) {
  // Up to 256 bytes come whole or not at all.
  return getrandom(key.data(), key.size(), 0) == static_cast<ssize_t>(key.size());
}

/// A new name in a folder is safe only when the folder is synced, too.
void syncFolderOf(const char* path) {
  std::array<char, PATH_MAX> folder{};
  std::snprintf(folder.data(), folder.size(), "%s", path);
  char* slash = std::strrchr(folder.data(), '/');
  if (slash == nullptr) return;
  slash[slash == folder.data() ? 1 : 0] = '\0';
  const Descriptor directory(open(folder.data(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (directory.isOpen()) fsync(directory.get());
}

/// Fills a private file beside `path` and gives it that name unless another
/// process was faster: link never replaces.
bool makeKey(const char* path) {
  std::array<char, PATH_MAX> draft{};
  const int length = std::snprintf(draft.data(), draft.size(), "%s.XXXXXX", path);
  if (length < 0 || static_cast<std::size_t>(length) >= draft.size()) {
    return refuse(path, std::strerror(ENAMETOOLONG));
  }
  const Descriptor file(mkostemp(draft.data(), O_CLOEXEC));
  if (!file.isOpen()) return refuse(path, std::strerror(errno));

  Key key{};
  const bool linked = fillRandom(key) && writeAll(file.get(), key) &&
                      (link(draft.data(), path) == 0 || errno == EEXIST);
  const int error = errno;
  explicit_bzero(key.data(), key.size());
  unlink(draft.data());
  if (!linked) return refuse(path, std::strerror(error));
  syncFolderOf(path);
  return true;
}

Descriptor openKey(const char* path) {
  return Descriptor(open(path, O_RDONLY | O_CLOEXEC | O_NONBLOCK));
}

bool readKey(const char* path, const Descriptor& file, Key& key) {
  struct stat status {};
  if (fstat(file.get(), &status) != 0) return refuse(path, std::strerror(errno));
  if (const char* reason = fault(status)) return refuse(path, reason);
  return readAll(file.get(), key) || refuse(path, "cannot be read");
}

}  // namespace

const char* keyFilePath() {
  const char* chosen = secure_getenv("KELDCORE_KEY_FILE");
  return chosen != nullptr && *chosen != '\0' ? chosen : KELDCORE_KEY_FILE;
}

bool loadKey(const char* path, Key& key) {
  const Descriptor present = openKey(path);
  if (present.isOpen()) return readKey(path, present, key);
  if (errno != ENOENT) return refuse(path, std::strerror(errno));

  if (!makeKey(path)) return false;
  const Descriptor made = openKey(path);
  if (!made.isOpen()) return refuse(path, std::strerror(errno));
  return readKey(path, made, key);
}

}  // namespace keldcore
