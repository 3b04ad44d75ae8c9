#ifndef KELDOAUTH_UTILS_DESCRIPTOR_H
#define KELDOAUTH_UTILS_DESCRIPTOR_H

#include <unistd.h>

#include <cerrno>
#include <cstddef>
#include <string_view>

namespace KELDOAUTHSERVER {

/// A file that is open, by its number; closed with the scope. Below 0: it could
/// not be opened.
class Descriptor {
 public:
  explicit Descriptor(int value) : value_(value) {}
  ~Descriptor() {
    if (isOpen()) close(value_);
  }
  Descriptor(const Descriptor&) = delete;
  Descriptor& operator=(const Descriptor&) = delete;

  [[nodiscard]] bool isOpen() const { return value_ >= 0; }
  [[nodiscard]] int get() const { return value_; }

 private:
  int value_;
};

/// All of it, however many writes that takes and whatever signals come in
/// between; false with errno otherwise.
inline bool writeAll(int descriptor, std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t put = write(descriptor, bytes.data(), bytes.size());
    if (put < 0 && errno == EINTR) continue;
    if (put < 0) return false;
    bytes.remove_prefix(static_cast<std::size_t>(put));
  }
  return true;
}

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_UTILS_DESCRIPTOR_H
