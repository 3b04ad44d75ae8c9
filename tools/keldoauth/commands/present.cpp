#include "tools/keldoauth/commands/present.h"

#include <vector>

#include "tools/keldoauth/console/clock.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/storage/encrypted_values.h"
#include "utils/clock.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;
using grants::AccessEntry;
using grants::Application;

namespace tool {
namespace {

constexpr char kNotDecrypted[] = "(cannot be decrypted)";

template <typename Kind>
Json::Value texts(const std::vector<grants::Text<Kind>>& list) {
  Json::Value all(Json::arrayValue);
  for (const auto& item : list) all.append(item.text());
  return all;
}

void presentIdentifier(Json::Value& shown, const std::string& identifier) {
  const bool isReadable = isDecrypted(identifier);
  shown[names::kClientId] = isReadable ? Json::Value(identifier) : Json::Value();
  if (!isReadable) shown["undecrypted"].append(names::kClientId);
}

const char* kindOf(const AccessEntry& entry) {
  switch (entry.kind) {
    case AccessEntry::Kind::kCode:
      return "code";
    case AccessEntry::Kind::kSpent:
      return "redeemed";
    case AccessEntry::Kind::kLogin:
      return "login";
    case AccessEntry::Kind::kOwn:
      break;
  }
  return "own";
}

void presentTimes(Json::Value& shown, const AccessEntry& entry) {
  shown[names::kExpiredTime] = Json::Int64(entry.expires);
  shown["expires_at"] = timeOrNull(entry.expires);
  shown["expired"] = isExpired(entry);
  shown["since"] = secondsOrNull(entry.since);
  shown["renewed"] = secondsOrNull(entry.renewed);
  shown["ends"] = Json::Int64(entry.ends);
  shown["dead"] = entry.isDead;
}

}  // namespace

// Documents -----------------------------------------------------------------------

Json::Value secondsOrNull(long long seconds) {
  return seconds == 0 ? Json::Value() : Json::Value(Json::Int64(seconds));
}

Json::Value timeOrNull(long long seconds) {
  const std::string text = isoTime(seconds);
  return text.empty() ? Json::Value() : Json::Value(text);
}

Json::Value present(const Application& application, const std::optional<grants::Secret>& secret,
                    Secrets secrets) {
  Json::Value shown;
  shown[names::kId] = Json::Int64(application.row);
  shown["enabled"] = application.isEnabled;
  shown["public"] = application.kind == grants::ApplicationKind::kPublic;
  shown["pkce_required"] = application.needsPkce;
  shown["registered_itself"] = application.registeredItself;
  presentIdentifier(shown, application.identifier.text());
  shown[names::kClientSecret] = Json::Value();
  if (secret) {
    shown[names::kClientSecret] =
        secrets == Secrets::kShown ? secret->text() : masked(secret->text());
  }
  shown["redirect_uris"] = texts(application.addresses);
  shown[names::kRedirectUri] = listText(shown["redirect_uris"]);
  shown["logout_uris"] = texts(application.logoutAddresses);
  shown[names::kScope] = application.scope.text();
  shown[names::kDisplayName] = application.name.text();
  return shown;
}

Json::Value present(const AccessEntry& entry) {
  Json::Value shown;
  shown[names::kId] = Json::Int64(entry.handle.row);
  shown["kind"] = kindOf(entry);
  shown[names::kUsername] = entry.user ? Json::Value(entry.user->text()) : Json::Value();
  presentIdentifier(shown, entry.application.text());
  shown["client_name"] =
      entry.applicationName ? Json::Value(entry.applicationName->text()) : Json::Value();
  shown[names::kScope] = entry.scope.text();
  presentTimes(shown, entry);
  shown[names::kState] = entry.text.text();
  shown[names::kIp] = entry.from.text();
  shown["foreign"] = entry.isForeign;
  if (isCode(entry)) {
    shown[names::kCode] = Json::Value();
  } else {
    shown[names::kAccessToken] = Json::Value();
    shown[names::kRefreshToken] = Json::Value();
    shown[names::kFlowType] = entry.flow;
  }
  return shown;
}

bool isCode(const AccessEntry& entry) {
  return entry.handle.table == grants::AccessHandle::Table::kCodes;
}

/// A code that was revoked this second is expired; a token is good until the
/// end of its last second.
bool isExpired(const AccessEntry& entry) {
  return isCode(entry) ? entry.expires <= currentTime() : entry.expires < currentTime();
}

// Texts ---------------------------------------------------------------------------

std::string describedAccess(const Json::Value& row) {
  const Json::Value& user = row[names::kUsername];
  return (row.isMember(names::kCode) ? "code " : "token ") + row[names::kId].asString() + " of " +
         printable(user.isNull() ? clientText(row) + " itself" : user.asString());
}

std::string describedClient(const Json::Value& row) {
  return "client " + row[names::kId].asString() + " (" +
         printable(row[names::kDisplayName].asString()) + ")";
}

std::string describedClient(const Application& application) {
  return describedClient(present(application, {}, Secrets::kMasked));
}

std::string identifierText(const Json::Value& row) {
  return row[names::kClientId].isNull() ? kNotDecrypted : cellText(row[names::kClientId]);
}

std::string secretText(const Json::Value& row) {
  if (row["public"].asBool()) return "none, it is public";
  return row[names::kClientSecret].isNull() ? kNotDecrypted : cellText(row[names::kClientSecret]);
}

std::string clientText(const Json::Value& row) {
  const Json::Value& name = row["client_name"];
  if (!name.isNull()) return name.asString();
  if (row[names::kClientId].isNull()) return kNotDecrypted;
  return "removed " + masked(row[names::kClientId].asString());
}

std::string userText(const Json::Value& row) {
  return row[names::kUsername].isNull() ? "(client itself)" : row[names::kUsername].asString();
}

std::string expiryText(const Json::Value& row) {
  const Json::Value& time = row["expires_at"];
  return time.isNull() ? row[names::kExpiredTime].asString() : time.asString();
}

std::string remainingText(const Json::Value& row) {
  if (row["kind"] == "redeemed") return "redeemed";
  if (row["expired"].asBool()) return "expired";
  return duration(row[names::kExpiredTime].asInt64() - currentTime());
}

std::string expiryAndRemainingText(const Json::Value& row) {
  const std::string remaining = remainingText(row);
  const bool isOver = row["expired"].asBool() || row["kind"] == "redeemed";
  return expiryText(row) + (isOver ? ", " : ", in ") + remaining;
}

std::string endText(const Json::Value& row) {
  return row["dead"].asBool() ? "dead" : duration(row["ends"].asInt64() - currentTime());
}

std::string sinceText(const Json::Value& row) {
  return row["since"].isNull() ? "-" : isoTime(row["since"].asInt64());
}

std::string foreignText(const Json::Value& row) {
  return row["foreign"].asBool() ? "another program, in the clear" : "this service";
}

std::string listText(const Json::Value& list) {
  std::string text;
  for (const Json::Value& item : list) text += (text.empty() ? "" : " ") + item.asString();
  return text;
}

}  // namespace tool
