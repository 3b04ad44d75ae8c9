// What a grant must remember beyond its columns rides in `state`, the one
// column whose text is the service's own:
//
//   of a code    base64url(redirect address) . how it was named . PKCE challenge
//   of a token   base64url(scope of the grant) . digest of the code . when issued
//
// Base64url has no quote, so the text comes back from the store as it went in,
// and no dot, so the fields cannot run into each other. The client's own state
// goes back to it together with the code: nobody has to keep that.

#ifndef KELDOAUTH_EXAMPLES_CGI_CODE_STATE_H
#define KELDOAUTH_EXAMPLES_CGI_CODE_STATE_H

#include <cstddef>
#include <optional>
#include <string>

namespace service {

/// The longest redirect address that fits, packed, into the 2048 bytes of the
/// column.
inline constexpr std::size_t kMaxRedirect = 1400;

struct CodeState {
  std::string redirect;   // where the code was sent
  bool redirectWasGiven;  // in the request; then redeeming must repeat it
  std::string challenge;  // PKCE, S256
};

std::string pack(const CodeState& state);

/// Nothing for a text that `pack` did not write.
std::optional<CodeState> unpackCodeState(const std::string& text);

struct TokenState {
  std::string grantScope;  // a refresh may narrow the token's scope, never this one
  std::string codeDigest;  // which code it came from; empty without a code
  long long issued;        // Unix seconds
};

std::string pack(const TokenState& state);
std::optional<TokenState> unpackTokenState(const std::string& text);

}  // namespace service

#endif  // KELDOAUTH_EXAMPLES_CGI_CODE_STATE_H
