// The file that the keys lie in.

#ifndef KELDOAUTH_SERVICE_SIGNING_KEY_FILE_H
#define KELDOAUTH_SERVICE_SIGNING_KEY_FILE_H

#include <sys/stat.h>

#include <functional>
#include <optional>
#include <string>

#include "service/signing/key_set.h"

namespace keldoauth::service::signing {

/// Whose a new file is: by default the process's own, and nobody else's.
struct Access {
  uid_t owner = static_cast<uid_t>(-1);  // -1 keeps
  gid_t group = static_cast<gid_t>(-1);
  mode_t mode = 0600;
};

/// A regular file, no link, that belongs to the effective user or to root, and that
/// its group may read at most. What is written is on the disk before it has its
/// name, and the name is before the call is done: whoever reads, or dies, or
/// loses power at any point finds the old keys or the new ones.
///
/// Everything below throws KeyFault, which names the file and what is wrong.
class KeyFile {
 public:
  explicit KeyFile(std::string path) : path_(std::move(path)) {}

  /// Read at the first call, and again when another file has taken the place of
  /// the one that was read or that one has changed. The reference is good until
  /// the next call.
  const KeySet& keys();

  /// Never overwrites: a file, link or whatever else of that name is left alone,
  /// and the call fails.
  void create(const KeySet& keys, const Access& access) const;

  /// Replaces the keys by what `change` makes of them, unless that is what they
  /// were; owner, group and mode stay. One process after the other: each one
  /// changes what the one before it has left.
  void update(const std::function<void(KeySet&)>& change) const;

 private:
  /// Tells one state of one file from all others.
  struct Stamp {
    dev_t device = 0;
    ino_t inode = 0;
    timespec changed{};

    Stamp() = default;
    explicit Stamp(const struct stat& status)
        : device(status.st_dev), inode(status.st_ino), changed(status.st_ctim) {}
    bool operator==(const Stamp& other) const;
  };

  [[nodiscard]] bool isCurrent() const;

  std::string path_;
  std::optional<KeySet> keys_;
  Stamp stamp_;
};

}  // namespace keldoauth::service::signing

#endif  // KELDOAUTH_SERVICE_SIGNING_KEY_FILE_H
