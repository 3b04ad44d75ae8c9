// Encodings and digests, from Nettle.

#ifndef KELDOAUTH_SERVICE_TEXT_ENCODING_H
#define KELDOAUTH_SERVICE_TEXT_ENCODING_H

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace keldoauth::service {

/// RFC 4648, 5, without padding, as RFC 7515 and 7636 want it.
std::string base64Url(std::string_view bytes);

/// The plain alphabet, as the Basic scheme uses it.
std::optional<std::string> base64Decode(std::string_view text);

/// The digest's bytes.
std::string hmacSha256(std::string_view key, std::string_view text);

/// For the value of a parameter in a query or a form.
std::string percentEncode(std::string_view text);

/// How many bytes the character at the start of `text`, which is not empty,
/// takes; 0 when they are not UTF-8 (RFC 3629).
std::size_t characterLength(std::string_view text);
bool isUtf8(std::string_view text);

/// One of ASCII: a byte below the blank, or the one beyond the tilde.
bool isControl(char c);

/// A letter of ASCII as a small one, and any other character as it is.
char lowerCase(char c);

/// Takes as long for a near miss as for a far one.
bool equalSecrets(std::string_view a, std::string_view b);

/// The decimal number at the start of a text; 0 without one.
long long number(const std::string& text);

std::vector<std::string> split(std::string_view text, char separator);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_TEXT_ENCODING_H
