// The service as one program. The web server starts it for a request (CGI), or
// with a socket to wait at as its standard input (FastCGI); the owner of the box
// starts it with a command.

#include <cstdlib>

#include "service/http/gateway_cgi.h"
#include "service/http/gateway_fcgi.h"
#include "service/program/commands.h"
#include "service/program/service.h"

namespace {

using namespace keldoauth::service;

constexpr char kSettingsVariable[] = "KELDOAUTH_SERVICE_SETTINGS";
constexpr char kSettingsFile[] = "/etc/keldoauth/service.json";

const char* settingsPath() {
  const char* const path = std::getenv(kSettingsVariable);
  return path == nullptr ? kSettingsFile : path;
}

/// A web server may hand on words of the query as arguments (RFC 3875, 4.4): they
/// are no command of anybody's.
bool isRequest() {
  return std::getenv("REQUEST_METHOD") != nullptr || std::getenv("GATEWAY_INTERFACE") != nullptr;
}

}  // namespace

int main(int argc, char** argv) {
  const bool isServer = isFastCgi();
  if (!isRequest() && (argc > 1 || !isServer)) return runCommand(argc, argv, settingsPath());
  Service service(settingsPath());
  const Answering answering = [&](const Request& request) { return service.answer(request); };
  return isServer ? serveFastCgi(answering) : serveCgi(answering);
}
