#include "service/store/kept_store.h"

namespace keldoauth::service {

grants::Grants& KeptStore::open() {
  if (!store_) store_.emplace();
  return *store_;
}

void KeptStore::drop() {
  store_.reset();
}

}  // namespace keldoauth::service
