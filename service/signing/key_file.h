// The file that the keys lie in.

#ifndef KELDOAUTH_SERVICE_SIGNING_KEY_FILE_H
#define KELDOAUTH_SERVICE_SIGNING_KEY_FILE_H

#include <sys/types.h>

#include <functional>
#include <string>
#include <utility>

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

  [[nodiscard]] KeySet read() const;

  /// Never overwrites: a file, link or whatever else of that name is left alone,
  /// and the call fails.
  void create(const KeySet& keys, const Access& access) const;

  /// Replaces the keys by what `change` makes of them, unless that is what they
  /// were; owner, group and mode stay. One process after the other: each one
  /// changes what the one before it has left.
  void update(const std::function<void(KeySet&)>& change) const;

 private:
  std::string path_;
};

}  // namespace keldoauth::service::signing

#endif  // KELDOAUTH_SERVICE_SIGNING_KEY_FILE_H
