#ifndef KELDOAUTH_UTILS_FOLDER_H
#define KELDOAUTH_UTILS_FOLDER_H

#include <fcntl.h>
#include <unistd.h>

#include <string>

#include "utils/descriptor.h"

namespace KELDOAUTHSERVER {

/// Of the file that a path names; "." where it names none.
inline std::string folderOf(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  if (slash == std::string::npos) return ".";
  return slash == 0 ? "/" : path.substr(0, slash);
}

/// A new, changed or removed name survives a power cut only when its folder is
/// synced, too. False with errno otherwise.
inline bool syncFolderOf(const std::string& path) {
  const Descriptor folder(open(folderOf(path).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  return folder.isOpen() && fsync(folder.get()) == 0;
}

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_UTILS_FOLDER_H
