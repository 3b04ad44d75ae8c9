#include "grants/outcome.h"

#include <array>
#include <cstddef>

namespace KELDOAUTHSERVER::grants {
namespace {

// In the order of the enumerators.

constexpr std::array kCodes{
    "invalid_request", "invalid_client",      "invalid_grant",        "unauthorized_client",
    "invalid_scope",   "invalid_token",       "invalid_redirect_uri", "invalid_client_metadata",
    "access_denied",   "invalid_request_uri",
};
static_assert(kCodes.size() == static_cast<std::size_t>(Error::kInvalidRequestUri) + 1);

constexpr std::array kReasons{
    "A value has a NUL byte",
    "A value is too short or too long",
    "No user can have this name",
    "The IP address is none",
    "The values are too long together",
    "The application is not registered",
    "The application is disabled",
    "Unknown application or wrong secret",
    "It was issued to another application",
    "An application without a secret cannot do this",
    "It is unknown or has been ended",
    "It has expired",
    "It was used before",
    "It was used before; the access that came from it has been ended",
    "The redirect address is not the one of the authorization request",
    "The verifier does not fit the challenge",
    "A code challenge is required",
    "The scope is wider than allowed",
    "It was issued by another program",
    "The address is not absolute, or has characters that no address has",
    "A name cannot look like an identifier",
    "The identifier is taken",
    "The user has to be asked: no login covers it",
    "The user has to be asked: another login would have to end",
};
static_assert(kReasons.size() == static_cast<std::size_t>(Why::kWouldEvict) + 1);

}  // namespace

const char* codeText(Error error) {
  return kCodes.at(static_cast<std::size_t>(error));
}

const char* explain(Why why) {
  return kReasons.at(static_cast<std::size_t>(why));
}

}  // namespace KELDOAUTHSERVER::grants
