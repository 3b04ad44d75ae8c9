#ifndef KELDOAUTH_SERVICE_SIGNING_STRICT_JSON_H
#define KELDOAUTH_SERVICE_SIGNING_STRICT_JSON_H

#include <json/value.h>

#include <optional>
#include <string>
#include <string_view>

namespace keldoauth::service::signing {

/// An object of RFC 8259 and nothing else: no comment, no member twice, nothing
/// behind it, not nested deeper than keys and tokens are.
std::optional<Json::Value> readObject(std::string_view text);

/// On one line, without blanks.
std::string compactText(const Json::Value& value);

}  // namespace keldoauth::service::signing

#endif  // KELDOAUTH_SERVICE_SIGNING_STRICT_JSON_H
