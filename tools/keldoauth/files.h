// Files that must be whole on disk before anybody relies on them.

#ifndef KELDOAUTH_TOOLS_FILES_H
#define KELDOAUTH_TOOLS_FILES_H

#include <string>

#include "tools/keldoauth/failure.h"

namespace tool {

/// "<path>: <the system's reason>".
Failure systemFailure(const std::string& path);

/// Makes a new or changed name in the folder of `path` survive a power cut, as
/// far as the system allows.
void syncFolderOf(const std::string& path);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_FILES_H
