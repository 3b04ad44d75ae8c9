#include "engines/choice/choice.h"

#include <unistd.h>

#include <array>
#include <cerrno>
#include <string_view>

#include "utils/wide_time.h"

namespace KELDOAUTHSERVER::engines {

bool isOnServer(const char* path) {
  std::array<char, sizeof kServerFile> target{};
  const int error = errno;  // SQLite is to find it as whoever opens has left it
  const ssize_t length = readlink(path, target.data(), target.size());
  errno = error;
  return length > 0 &&
         std::string_view(target.data(), static_cast<std::size_t>(length)) == kServerFile;
}

}  // namespace KELDOAUTHSERVER::engines
