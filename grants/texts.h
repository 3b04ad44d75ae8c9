// Texts that must not be taken for one another: an application's name cannot be
// passed where its redirect address belongs, nor a code where a token does.
//
// Every text goes in and comes out as it is, byte by byte, single quotes
// included. None may hold a NUL byte: an operation that is given one refuses it
// before it looks anything up. Bounds are bytes, both ends included.

#ifndef KELDOAUTH_GRANTS_TEXTS_H
#define KELDOAUTH_GRANTS_TEXTS_H

#include <string>
#include <utility>

#include "utils/oauth_bounds.h"

namespace KELDOAUTHSERVER::grants {

/// A text of one kind. Only `text()` makes a plain string of it.
template <typename Kind>
class Text {
 public:
  Text() = default;
  explicit Text(std::string text) : text_(std::move(text)) {}

  [[nodiscard]] const std::string& text() const { return text_; }

  friend bool operator==(const Text& a, const Text& b) { return a.text_ == b.text_; }
  friend bool operator!=(const Text& a, const Text& b) { return a.text_ != b.text_; }
  friend bool operator<(const Text& a, const Text& b) { return a.text_ < b.text_; }

 private:
  std::string text_{};
};

// Applications ----------------------------------------------------------------

/// What the protocol calls client_id: 64 bytes.
using ApplicationId = Text<struct ApplicationIdKind>;
/// What people call it: 1 to 64 bytes, not necessarily its own alone.
using ApplicationName = Text<struct ApplicationNameKind>;
/// client_secret: 64 bytes.
using Secret = Text<struct SecretKind>;
/// An address to return to, with its scheme.
using RedirectAddress = Text<struct RedirectAddressKind>;
/// Where a user may be sent after logging out, with its scheme.
using LogoutAddress = Text<struct LogoutAddressKind>;

// Grants ----------------------------------------------------------------------

/// Who grants: 1 to 256 bytes, whatever the box calls its users. One text names
/// no user: `kNoUser`, below.
using User = Text<struct UserKind>;
/// Scope names with blanks between them: 1 to 2048 bytes.
using Scope = Text<struct ScopeKind>;
/// What is handed out as an authorisation code.
using Code = Text<struct CodeKind>;
/// What a bearer shows.
using AccessToken = Text<struct AccessTokenKind>;
using RefreshToken = Text<struct RefreshTokenKind>;
/// A token that somebody shows without saying which of the two it is.
using AnyToken = Text<struct AnyTokenKind>;
/// PKCE: what comes with the authorisation request, and with the code. The
/// challenge 1 to 128 bytes.
using Challenge = Text<struct ChallengeKind>;
using Verifier = Text<struct VerifierKind>;
/// A text of the caller's own that goes along with a login, through its
/// refreshes too.
using CallerText = Text<struct CallerTextKind>;
inline constexpr Bounds kCallerTextBounds{0, 512};
/// The parameters of a pushed request, in a form of the caller's own.
using RequestText = Text<struct RequestTextKind>;
inline constexpr Bounds kRequestTextBounds{1, 2000};
/// What stands for it: 64 lowercase hexadecimal digits. The caller's to put
/// behind "urn:ietf:params:oauth:request_uri:".
using RequestReference = Text<struct RequestReferenceKind>;
/// An IPv4 or IPv6 address, or empty.
using PeerAddress = Text<struct PeerAddressKind>;

/// Who does it, for the audit log: an administrator, the user, the application.
using Actor = Text<struct ActorKind>;
/// An application that changes what it is registered with, or removes itself.
inline const Actor kItself;

/// Stands in the rows of an application that acts for itself where the user
/// stands elsewhere. No user may have this name: a grant for it is refused.
inline constexpr char kNoUser[] = "(application)";

}  // namespace KELDOAUTHSERVER::grants

#endif  // KELDOAUTH_GRANTS_TEXTS_H
