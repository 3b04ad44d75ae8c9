// What the answers show of applications and of what was granted: secrets
// masked, times also in a form that people read.

#ifndef KELDOAUTH_TOOLS_PRESENT_H
#define KELDOAUTH_TOOLS_PRESENT_H

#include <json/value.h>

#include <optional>
#include <string>

#include "grants/access.h"
#include "grants/applications.h"

namespace tool {

/// In the clear or masked.
enum class Secrets { kMasked, kShown };

inline Secrets shownIf(bool reveal) {
  return reveal ? Secrets::kShown : Secrets::kMasked;
}

/// What could not be decrypted is null in a document, and the member
/// "undecrypted" (an array, only there when needed) has its name.
Json::Value present(const KELDOAUTHSERVER::grants::Application& application,
                    const std::optional<KELDOAUTHSERVER::grants::Secret>& secret, Secrets secrets);

/// A code or a token. The texts themselves are kept by nobody, and null.
Json::Value present(const KELDOAUTHSERVER::grants::AccessEntry& entry);

bool isCode(const KELDOAUTHSERVER::grants::AccessEntry& entry);
bool isExpired(const KELDOAUTHSERVER::grants::AccessEntry& entry);

/// "code 3 of alice", "token 4 of Photo Frame itself", of a presented row.
std::string describedAccess(const Json::Value& row);
/// "client 1 (Photo Frame)", likewise.
std::string describedClient(const Json::Value& row);
std::string describedClient(const KELDOAUTHSERVER::grants::Application& application);

/// `seconds` in the forms of documents; null for 0, which is not known.
Json::Value secondsOrNull(long long seconds);
Json::Value timeOrNull(long long seconds);

// Columns' texts, made of a presented row.

std::string identifierText(const Json::Value& row);
std::string secretText(const Json::Value& row);
std::string clientText(const Json::Value& row);
std::string userText(const Json::Value& row);
std::string expiryText(const Json::Value& row);
std::string remainingText(const Json::Value& row);
std::string expiryAndRemainingText(const Json::Value& row);
/// When it is dead if nobody uses it.
std::string endText(const Json::Value& row);
std::string sinceText(const Json::Value& row);
/// "yes" for a row in the clear.
std::string foreignText(const Json::Value& row);
/// The members of an array, one after the other.
std::string listText(const Json::Value& list);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_PRESENT_H
