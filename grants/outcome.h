// What a request did wrong, as a value. What the store could not do is not a
// value but an exception: grants/trouble.h.

#ifndef KELDOAUTH_GRANTS_OUTCOME_H
#define KELDOAUTH_GRANTS_OUTCOME_H

#include <utility>
#include <variant>

namespace KELDOAUTHSERVER::grants {

/// One for each error code of the protocol that an operation can end with.
enum class Error {
  kInvalidRequest,         // RFC 6749: a value out of its bounds, or missing
  kInvalidClient,          // RFC 6749: no such application, disabled, or not it
  kInvalidGrant,           // RFC 6749: a code or refresh token that is no good
  kUnauthorizedClient,     // RFC 6749: not for this kind of application
  kInvalidScope,           // RFC 6749: wider than what it was granted out of
  kInvalidToken,           // RFC 6750: an access token that is no good
  kInvalidRedirectUri,     // RFC 7591
  kInvalidClientMetadata,  // RFC 7591: anything else of a registration
  kAccessDenied,           // RFC 6749: the user has to be asked first
  kInvalidRequestUri,      // RFC 9101: a pushed request that is no good
};

/// The code as it stands in an answer: "invalid_request", ...
const char* codeText(Error error);

/// Why, for people and logs. An application that is told more than the code
/// learns nothing that it could not find out: the texts name no other party.
enum class Why {
  kHasNul,            // a text with a NUL byte
  kOutOfBounds,       // a text that is too short or too long
  kReservedUser,      // the name kNoUser
  kBadPeer,           // an IP address that is none
  kTooMuch,           // the texts of a grant together: more than a row holds
  kNoApplication,     // not registered, or not any more
  kDisabled,          // the application is switched off
  kWrongSecret,       // or one where none belongs, or none where one does
  kOtherApplication,  // issued to another application
  kPublic,            // an application without a secret cannot do this
  kUnknown,           // never issued, ended, or of another form
  kExpired,
  kUsedBefore,        // moments ago: nothing else happened
  kReplayed,          // shown again: what came from it has been ended
  kWrongAddress,      // not the redirect address that the code was asked with
  kWrongVerifier,     // does not fit the challenge, or only one of them is there
  kNeedsPkce,         // the application may ask for codes only with a challenge
  kWiderScope,        // names more than it may
  kForeign,           // another program's row: readable here, not renewable
  kBadAddress,        // no absolute address, or one with a blank
  kNameIsIdentifier,  // a name that could be mistaken for an identifier
  kTaken,             // the identifier is another application's
  kNotRemembered,     // no login of the user's covers what is asked for
  kWouldEvict,        // something that lives would have to go, and may not
};

/// A short English sentence in the characters that RFC 6749 allows an
/// error_description.
const char* explain(Why why);

/// What an operation refused, and why.
struct Refusal {
  Error error;
  Why why;
};

/// What came of an operation: its value, or a refusal. Nothing was changed by
/// an operation that refused, but for a replay, which says so.
///
///   if (!outcome) return answer(codeText(outcome.refusal().error));
///   use(outcome->access);
template <typename Value>
class Outcome {
 public:
  Outcome(Value value) : either_(std::move(value)) {}
  Outcome(Refusal refusal) : either_(refusal) {}

  explicit operator bool() const { return std::holds_alternative<Value>(either_); }

  /// Only of an outcome that is true; std::bad_variant_access otherwise.
  const Value& operator*() const { return std::get<Value>(either_); }
  const Value* operator->() const { return &std::get<Value>(either_); }

  /// Only of an outcome that is false; std::bad_variant_access otherwise.
  [[nodiscard]] const Refusal& refusal() const { return std::get<Refusal>(either_); }

 private:
  std::variant<Value, Refusal> either_;
};

/// The value of an operation that has nothing to tell.
struct Done {};

}  // namespace KELDOAUTHSERVER::grants

#endif  // KELDOAUTH_GRANTS_OUTCOME_H
