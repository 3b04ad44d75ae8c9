// Cookies of this service. Behind TLS they carry the prefix __Host-, by which the
// browser itself sees to it that nobody but this host has set them; on plain
// http, which a box speaks to itself alone, they have their bare name.

#ifndef KELDOAUTH_SERVICE_HTTP_COOKIES_H
#define KELDOAUTH_SERVICE_HTTP_COOKIES_H

#include <optional>
#include <string>
#include <string_view>

#include "service/http/request.h"

namespace keldoauth::service {

/// The value of the cookie `name`, empty when the browser has none; nothing when
/// it sends several: one of them was slipped in, and nobody can say which.
std::optional<std::string> cookieValue(const Request& request, std::string_view name);

/// The text of a Set-Cookie header for every path of this host, out of reach for
/// scripts and not sent along with the forms of other sites. `seconds`: how long
/// the browser keeps it; 0: until it is closed. `value` is of characters that a
/// cookie may have (RFC 6265, 4.1.1).
std::string cookieToSet(const Request& request, std::string_view name, const std::string& value,
                        long seconds = 0);

/// The same for a cookie that is to go.
std::string cookieToForget(const Request& request, std::string_view name);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_HTTP_COOKIES_H
