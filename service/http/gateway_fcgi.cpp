#include "service/http/gateway_fcgi.h"

#include <fcgiapp.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <climits>
#include <csignal>
#include <cstdlib>

namespace keldoauth::service {
namespace {

constexpr int kListening = STDIN_FILENO;

/// A signal between the look at the flag and the wait for a connection would be
/// lost: another one follows.
void shutDown(int /*signal*/) {
  FCGX_ShutdownPending();
  alarm(1);
}

/// The signals that end the service are let in between requests alone.
class Ending {
 public:
  Ending() {
    struct sigaction action {};
    action.sa_handler = shutDown;  // and no SA_RESTART: a wait ends
    sigemptyset(&ends_);
    for (const int signal : {SIGTERM, SIGALRM}) {
      sigaddset(&ends_, signal);
      sigaction(signal, &action, nullptr);
    }
    hold();
  }
  void hold() { sigprocmask(SIG_BLOCK, &ends_, nullptr); }
  void letIn() { sigprocmask(SIG_UNBLOCK, &ends_, nullptr); }

 private:
  sigset_t ends_{};
};

std::size_t read(FCGX_Stream* stream, char* into, std::size_t count) {
  const int most = static_cast<int>(std::min<std::size_t>(count, INT_MAX));
  const int got = FCGX_GetStr(into, most, stream);
  return got < 0 ? 0 : static_cast<std::size_t>(got);
}

/// A web server that has gone away is no trouble of ours.
void answer(const FCGX_Request& request, const Answering& answering) {
  const std::string text = respond(
      [&](const char* name) { return FCGX_GetParam(name, request.envp); },
      [&](char* into, std::size_t count) { return read(request.in, into, count); }, answering);
  FCGX_PutStr(text.data(), static_cast<int>(text.size()), request.out);
}

}  // namespace

bool isFastCgi() {
  int listens = 0;
  socklen_t size = sizeof listens;
  return getsockopt(kListening, SOL_SOCKET, SO_ACCEPTCONN, &listens, &size) == 0 && listens != 0;
}

int serveFastCgi(const Answering& answering) {
  FCGX_Request request{};
  if (FCGX_Init() != 0 || FCGX_InitRequest(&request, kListening, 0) != 0) return EXIT_FAILURE;
  Ending ending;
  for (;;) {
    ending.letIn();
    const int accepted = FCGX_Accept_r(&request);
    ending.hold();
    if (accepted < 0) break;
    answer(request, answering);
  }
  FCGX_Free(&request, 1);
  return EXIT_SUCCESS;
}

}  // namespace keldoauth::service
