// Rows as the answers show them: numbers as numbers, secrets masked, times also
// in a form that people read. All other texts are as the database has them.

#ifndef KELDOAUTH_TOOLS_ROWS_H
#define KELDOAUTH_TOOLS_ROWS_H

#include <json/value.h>

#include <string>

namespace tool {

/// Secrets, codes and tokens in the clear or masked.
enum class Secrets { kMasked, kShown };

inline Secrets shownIf(bool reveal) {
  return reveal ? Secrets::kShown : Secrets::kMasked;
}

/// An identifier or secret that could not be decrypted is null in the presented
/// row, and the member "undecrypted" (an array, only there when needed) has the
/// column's name.
Json::Value presentClient(const Json::Value& row, Secrets secrets);
Json::Value presentCode(const Json::Value& row, Secrets secrets);
Json::Value presentToken(const Json::Value& row, Secrets secrets);
Json::Value presentLogEntry(const Json::Value& row);

long long expiryOf(const Json::Value& row);
long long idOf(const Json::Value& row);

/// A code that was revoked this second is expired; a token is good until the
/// end of its last second.
bool isExpiredCode(long long expiry, long long now);
bool isExpiredToken(long long expiry, long long now);

/// Throws kUnavailable for a row whose identifier could not be decrypted:
/// nothing can be done in the name of its client.
std::string readableIdentifier(const Json::Value& row);

/// The texts of a presented row's identifier and secret.
std::string identifierText(const Json::Value& row);
std::string secretText(const Json::Value& row);

/// Columns' texts that need more than one member of a presented row.
std::string expiryText(const Json::Value& row);
std::string remainingText(const Json::Value& row);
std::string expiryAndRemainingText(const Json::Value& row);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_ROWS_H
