#include "platform/keldcgi.h"

#include <cstdlib>
#include <cstring>

/// The web server names the address in the environment of a CGI program.
int KeldCgiGetRemoteIP(char* buffer, size_t size) {
  const char* address = std::getenv("REMOTE_ADDR");
  if (buffer == nullptr || address == nullptr || *address == '\0') return -1;

  const size_t length = std::strlen(address);
  if (length >= size) return -1;
  std::memcpy(buffer, address, length + 1);
  return 0;
}
