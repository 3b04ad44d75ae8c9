#include "engines/choice/choice.h"

#include <unistd.h>

#include <array>
#include <string_view>

#include "utils/wide_time.h"

namespace KELDOAUTHSERVER::engines {

bool isOnServer(const char* path) {
  std::array<char, sizeof kServerFile> target{};
  const ssize_t length = readlink(path, target.data(), target.size());
  return length > 0 &&
         std::string_view(target.data(), static_cast<std::size_t>(length)) == kServerFile;
}

}  // namespace KELDOAUTHSERVER::engines
