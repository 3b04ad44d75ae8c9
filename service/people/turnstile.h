// Two checks of passwords at once, on the whole box: a check takes seconds, or
// much memory, and who asks for many must not keep every process of the service
// busy. The kernel takes the place back from a process that dies.

#ifndef KELDOAUTH_SERVICE_PEOPLE_TURNSTILE_H
#define KELDOAUTH_SERVICE_PEOPLE_TURNSTILE_H

#include <string>

namespace keldoauth::service {

class Turnstile {
 public:
  static constexpr int kPlaces = 2;

  /// Takes a place until it is destroyed, or until this process closes another
  /// descriptor of the same file. The places are locks on `path`, the file of the
  /// counters; where it cannot be opened everybody goes through.
  explicit Turnstile(const std::string& path);
  ~Turnstile();
  Turnstile(const Turnstile&) = delete;
  Turnstile& operator=(const Turnstile&) = delete;

  [[nodiscard]] bool isIn() const { return isIn_; }

 private:
  int descriptor_;
  bool isIn_;
};

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PEOPLE_TURNSTILE_H
