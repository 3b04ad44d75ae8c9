#ifndef KELDOAUTH_UTILS_FILE_H
#define KELDOAUTH_UTILS_FILE_H

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/types.h>
#include <unistd.h>

#include <cerrno>
#include <cstddef>

#include "utils/descriptor.h"

namespace KELDOAUTHSERVER {

/// An open file that closes itself.
class File {
 public:
  File(const char* path, int flags) : descriptor_(open(path, flags | O_CLOEXEC)) {}

  [[nodiscard]] bool isOpen() const { return descriptor_.isOpen(); }

  [[nodiscard]] bool isRegular() const {
    struct stat file {};
    return fstat(descriptor_.get(), &file) == 0 && S_ISREG(file.st_mode);
  }

  /// One read, taken up again when a signal interrupts it.
  ssize_t readSome(char* buffer, std::size_t size) const {
    ssize_t got = 0;
    do {
      got = read(descriptor_.get(), buffer, size);
    } while (got < 0 && errno == EINTR);
    return got;
  }

 private:
  Descriptor descriptor_;
};

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_UTILS_FILE_H
