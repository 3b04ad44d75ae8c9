// The parts of an http or https address, as far as the service wants them told
// apart.

#ifndef KELDOAUTH_SERVICE_HTTP_WEB_ADDRESS_H
#define KELDOAUTH_SERVICE_HTTP_WEB_ADDRESS_H

#include <optional>
#include <string>
#include <string_view>

namespace keldoauth::service {

struct WebAddress {
  bool isSecure = false;  // https
  std::string host;       // as it was written; an IPv6 address in its brackets
  std::string port;       // digits; empty without one
  std::string path;       // empty, or from the first slash
};

/// Of an absolute address in small letters and in the characters of RFC 3986,
/// without user, query and fragment; nothing for any other text.
std::optional<WebAddress> readWebAddress(std::string_view text);

/// Whether what is sent to this host stays on the machine.
bool isLoopbackHost(std::string_view host);

/// The same for the IP address that a request came from.
bool isLoopbackPeer(std::string_view peer);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_HTTP_WEB_ADDRESS_H
