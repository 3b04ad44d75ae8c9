// One request that the web server has started this process for (RFC 3875).

#ifndef KELDOAUTH_SERVICE_HTTP_GATEWAY_CGI_H
#define KELDOAUTH_SERVICE_HTTP_GATEWAY_CGI_H

#include "service/http/gateway.h"

namespace keldoauth::service {

/// The exit status: 0 when the answer could be written.
int serveCgi(const Answering& answering);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_HTTP_GATEWAY_CGI_H
