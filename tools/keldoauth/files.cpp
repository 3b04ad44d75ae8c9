#include "tools/keldoauth/files.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>

#include "tools/keldoauth/text.h"

namespace tool {

Failure systemFailure(const std::string& path) {
  return {kUnavailable, printable(path) + ": " + std::strerror(errno)};
}

void syncFolderOf(const std::string& path) {
  const std::string folder = std::filesystem::absolute(path).parent_path();
  const int descriptor = open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (descriptor < 0) return;
  fsync(descriptor);
  close(descriptor);
}

}  // namespace tool
