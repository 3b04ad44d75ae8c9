#include "service/http/gateway_cgi.h"

#include <cstdio>
#include <cstdlib>

namespace keldoauth::service {

int serveCgi(const Answering& answering) {
  const std::string text = respond(
      [](const char* name) { return std::getenv(name); },
      [](char* into, std::size_t count) { return std::fread(into, 1, count, stdin); }, answering);
  const bool written = std::fwrite(text.data(), 1, text.size(), stdout) == text.size();
  return written && std::fflush(stdout) == 0 ? 0 : 1;
}

}  // namespace keldoauth::service
