// Requests that come one after the other through a socket that the web server, or
// who started it, handed to this process as its standard input (FastCGI).

#ifndef KELDOAUTH_SERVICE_HTTP_GATEWAY_FCGI_H
#define KELDOAUTH_SERVICE_HTTP_GATEWAY_FCGI_H

#include "service/http/gateway.h"

namespace keldoauth::service {

/// Whether standard input is a socket that waits for connections.
bool isFastCgi();

/// Answers until SIGTERM, which lets the request that is under way come to its
/// end. The exit status.
int serveFastCgi(const Answering& answering);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_HTTP_GATEWAY_FCGI_H
