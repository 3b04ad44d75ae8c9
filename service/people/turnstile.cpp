#include "service/people/turnstile.h"

#include <fcntl.h>
#include <unistd.h>

#include "utils/wide_time.h"

namespace keldoauth::service {
namespace {

/// Far behind the counters, where there is nothing.
constexpr off_t kFirstPlace = off_t{1} << 30U;

bool takePlace(int descriptor) {
  for (int i = 0; i < Turnstile::kPlaces; ++i) {
    struct flock place {};
    place.l_type = F_WRLCK;
    place.l_whence = SEEK_SET;
    place.l_start = kFirstPlace + i;
    place.l_len = 1;
    if (fcntl(descriptor, F_SETLK, &place) == 0) return true;
  }
  return false;
}

}  // namespace

Turnstile::Turnstile(const std::string& path)
    : descriptor_(open(path.c_str(), O_RDWR | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC)),
      isIn_(descriptor_ < 0 || takePlace(descriptor_)) {}

Turnstile::~Turnstile() {
  if (descriptor_ >= 0) close(descriptor_);
}

}  // namespace keldoauth::service
