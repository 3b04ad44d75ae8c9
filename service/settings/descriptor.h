// A file that is open, by its number.

#ifndef KELDOAUTH_SERVICE_SETTINGS_DESCRIPTOR_H
#define KELDOAUTH_SERVICE_SETTINGS_DESCRIPTOR_H

#include <unistd.h>

namespace keldoauth::service {

/// Closes it. Below 0: it could not be opened.
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

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_SETTINGS_DESCRIPTOR_H
