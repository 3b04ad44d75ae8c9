// The store of this process: opened by the first request that needs it.

#ifndef KELDOAUTH_SERVICE_STORE_KEPT_STORE_H
#define KELDOAUTH_SERVICE_STORE_KEPT_STORE_H

#include <optional>

#include "grants/grants.h"

namespace keldoauth::service {

namespace grants = KELDOAUTHSERVER::grants;

class KeptStore {
 public:
  /// The open store. Throws grants::Trouble when it cannot be opened.
  grants::Grants& open();

  /// Closes it.
  void drop();

 private:
  std::optional<grants::Grants> store_;
};

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_STORE_KEPT_STORE_H
