// The service as one program. The web server starts it for a request (CGI), or
// with a socket to wait at as its standard input (FastCGI).

#include <cstdlib>

#include "service/http/gateway_cgi.h"
#include "service/http/gateway_fcgi.h"
#include "service/program/service.h"

namespace {

using namespace keldoauth::service;

constexpr char kSettingsVariable[] = "KELDOAUTH_SERVICE_SETTINGS";
constexpr char kSettingsFile[] = "/etc/keldoauth/service.json";

const char* settingsPath() {
  const char* const path = std::getenv(kSettingsVariable);
  return path == nullptr ? kSettingsFile : path;
}

}  // namespace

int main() {
  Service service(settingsPath());
  const Answering answering = [&](const Request& request) { return service.answer(request); };
  return isFastCgi() ? serveFastCgi(answering) : serveCgi(answering);
}
