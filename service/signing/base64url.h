// What the keys need of base64url (text/encoding.h) beside its writing.

#ifndef KELDOAUTH_SERVICE_SIGNING_BASE64URL_H
#define KELDOAUTH_SERVICE_SIGNING_BASE64URL_H

#include <optional>
#include <string>
#include <string_view>

namespace keldoauth::service::signing {

/// Nothing unless `text` is the one spelling of its bytes: no padding, no blank,
/// no bit set that says nothing.
std::optional<std::string> fromBase64Url(std::string_view text);

/// Base64url of the left half of the SHA-256: what `at_hash` and `c_hash` say of
/// a token or code beside an id_token signed with either algorithm.
std::string halfDigest(std::string_view text);

}  // namespace keldoauth::service::signing

#endif  // KELDOAUTH_SERVICE_SIGNING_BASE64URL_H
