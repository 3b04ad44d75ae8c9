// The store of this process: opened by the first request that needs it, and kept
// for the next ones as long as its file is the one under the name.

#ifndef KELDOAUTH_SERVICE_STORE_KEPT_STORE_H
#define KELDOAUTH_SERVICE_STORE_KEPT_STORE_H

#include <sys/types.h>

#include <optional>

#include "grants/grants.h"

namespace keldoauth::service {

namespace grants = KELDOAUTHSERVER::grants;

class KeptStore {
 public:
  /// What `open` gives from now on stays the same until the next call of this.
  void startRequest() { isOpen_ = false; }

  /// The open store: a new one when the file of the last has been replaced.
  /// Throws grants::Trouble when it cannot be opened.
  grants::Grants& open();

  /// True when this request has opened the store, and another file than the
  /// store's has its name by now: whatever the request has done may be gone, and
  /// whatever it has seen may be old.
  [[nodiscard]] bool wasReplaced() const;

  /// Closes it. References that `open` gave are no good any more.
  void drop();

 private:
  /// Which file it is; all zero for none.
  struct FileId {
    dev_t device = 0;
    ino_t number = 0;

    static FileId current();
    bool operator==(const FileId& other) const {
      return device == other.device && number == other.number;
    }
  };

  void construct();

  std::optional<grants::Grants> store_;
  FileId file_;
  bool isOpen_ = false;
};

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_STORE_KEPT_STORE_H
