#include "tools/keldoauth/console/invoker.h"

#include <pwd.h>
#include <unistd.h>

#include <array>
#include <cstdlib>

namespace tool {
namespace {

/// Only sudo's own user can be believed to have been given this by sudo.
std::string behindSudo() {
  const char* const name = getuid() == 0 ? std::getenv("SUDO_USER") : nullptr;
  return name != nullptr ? name : "";
}

std::string loggedIn() {
  std::array<char, 256> name{};
  return getlogin_r(name.data(), name.size()) == 0 ? name.data() : "";
}

std::string ofProcess() {
  const passwd* const entry = getpwuid(getuid());
  return entry != nullptr ? entry->pw_name : "uid " + std::to_string(getuid());
}

}  // namespace

std::string invoker() {
  for (const auto ask : {behindSudo, loggedIn}) {
    std::string name = ask();
    if (!name.empty()) return name;
  }
  return ofProcess();
}

}  // namespace tool
