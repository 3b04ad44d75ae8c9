#include "tests/support/private_mounts.h"

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <string>

#include "utils/oauth_names.h"

namespace support {

void requirePrivateMounts() {
  std::string stateDir = KELDOAUTHSERVER::names::kDatabaseFile;
  stateDir.erase(stateDir.rfind('/'));
  std::ifstream mounts("/proc/self/mountinfo");
  for (std::string line; std::getline(mounts, line);) {
    if (line.find(" " + stateDir + " ") != std::string::npos) return;
  }
  std::fprintf(stderr, "run this program through tests/support/sandbox.sh\n");
  std::exit(2);
}

}  // namespace support
