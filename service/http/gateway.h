// From the web server to an answer and back: what CGI (RFC 3875) and FastCGI
// have in common, the variables of a request and the text of an answer.

#ifndef KELDOAUTH_SERVICE_HTTP_GATEWAY_H
#define KELDOAUTH_SERVICE_HTTP_GATEWAY_H

#include <cstddef>
#include <functional>
#include <string>

#include "service/http/answer.h"
#include "service/http/request.h"

namespace keldoauth::service {

/// As std::getenv: null for what is not set.
using Environment = std::function<const char*(const char*)>;

/// Reads so many bytes of the body, and says how many there were.
using ReadBody = std::function<std::size_t(char* into, std::size_t count)>;

/// Answers every request, and throws nothing.
using Answering = std::function<Answer(const Request&)>;

/// Throws Refusal (answer.h) with 400, 413 or 414 for what breaks the limits.
Request readRequest(const Environment& environment, const ReadBody& body);

/// The text of what `answering` makes of the request, or of the refusal of one
/// that breaks the limits, with its status and headers as the web server wants
/// them. 500 when memory runs out.
std::string respond(const Environment& environment, const ReadBody& body,
                    const Answering& answering);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_HTTP_GATEWAY_H
