// What the keys could not do.

#ifndef KELDOAUTH_SERVICE_SIGNING_KEY_FAULT_H
#define KELDOAUTH_SERVICE_SIGNING_KEY_FAULT_H

#include <stdexcept>

namespace keldoauth::service::signing {

/// Says what stands in the way, and never any part of a key.
class KeyFault : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

}  // namespace keldoauth::service::signing

#endif  // KELDOAUTH_SERVICE_SIGNING_KEY_FAULT_H
