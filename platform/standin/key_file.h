// The stand-in cipher's key: 64 random bytes in a file that only its owner can
// read.

#ifndef KELDOAUTH_PLATFORM_STANDIN_KEY_FILE_H
#define KELDOAUTH_PLATFORM_STANDIN_KEY_FILE_H

#include <sys/stat.h>

#include <array>
#include <cstdint>
#include <cstring>

namespace keldcore {

/// Leaves nothing behind in memory.
struct Key {
  std::array<std::uint8_t, 64> bytes{};

  Key() = default;
  ~Key() { explicit_bzero(bytes.data(), bytes.size()); }
  Key(const Key&) = delete;
  Key& operator=(const Key&) = delete;
};

/// Tells one state of one file from all others: a key that was renamed into
/// place, written over, or opened to others has another stamp.
struct FileStamp {
  dev_t device = 0;
  ino_t inode = 0;
  timespec changed{};

  FileStamp() = default;
  explicit FileStamp(const struct stat& status)
      : device(status.st_dev), inode(status.st_ino), changed(status.st_ctim) {}

  bool operator==(const FileStamp& other) const {
    return device == other.device && inode == other.inode &&
           changed.tv_sec == other.changed.tv_sec && changed.tv_nsec == other.changed.tv_nsec;
  }
};

/// The file named by KELDCORE_KEY_FILE in the environment (ignored in a process
/// with raised privileges), else the one set when this was built.
const char* keyFilePath();

/// Where there is no key, nothing can be decrypted, not by a new one either.
enum class WhenAbsent { kMake, kFail };

/// Reads the key. An absent one is made on demand: whole or not at all, the same
/// for all processes that race for it, and only while the store has no value
/// that an earlier one encrypted. False, with one line in the system log, when
/// the file is not exactly a key, not a regular file of the effective user, or
/// open to anybody else, and when it is absent and not made.
bool loadKey(const char* path, WhenAbsent whenAbsent, Key& key, FileStamp& stamp);

/// Whether the file of that stamp stands there, as it was.
bool isUnchanged(const char* path, const FileStamp& stamp);

}  // namespace keldcore

#endif  // KELDOAUTH_PLATFORM_STANDIN_KEY_FILE_H
