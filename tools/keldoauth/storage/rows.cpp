#include "tools/keldoauth/storage/rows.h"

#include <charconv>
#include <initializer_list>
#include <system_error>

#include "tools/keldoauth/console/clock.h"
#include "tools/keldoauth/console/failure.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/storage/encrypted_values.h"
#include "utils/oauth_names.h"

namespace names = KELDOAUTHSERVER::names;

namespace tool {
namespace {

/// The database accepts any text as an expiry: one that is no number stays text.
Json::Value numberOrText(const Json::Value& value) {
  const std::string text = value.asString();
  Json::Int64 number = 0;
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, number);
  return error == std::errc() && stop == end ? Json::Value(number) : value;
}

Json::Value timeOrNull(long long seconds) {
  const std::string text = isoTime(seconds);
  return text.empty() ? Json::Value() : Json::Value(text);
}

void mask(Json::Value& row, Secrets secrets, std::initializer_list<const char*> columns) {
  if (secrets == Secrets::kShown) return;
  for (const char* column : columns) row[column] = masked(row[column].asString());
}

/// After masking: a mask of what could not be decrypted says nothing.
void markUndecrypted(Json::Value& shown, const Json::Value& row,
                     std::initializer_list<const char*> columns) {
  for (const char* column : columns) {
    if (!row.isMember(column) || isDecrypted(row[column].asString())) continue;
    shown[column] = Json::Value();
    shown["undecrypted"].append(column);
  }
}

std::string decryptedText(const Json::Value& row, const char* column) {
  return row[column].isNull() ? "(cannot be decrypted)" : cellText(row[column]);
}

void presentExpiry(Json::Value& row, bool (*isExpired)(long long expiry, long long now)) {
  const long long expiry = expiryOf(row);
  row["expires_at"] = timeOrNull(expiry);
  row["expired"] = isExpired(expiry, currentTime());
  row[names::kExpiredTime] = numberOrText(row[names::kExpiredTime]);
}

}  // namespace

Json::Value presentClient(const Json::Value& row, Secrets secrets) {
  Json::Value shown = row;
  shown[names::kId] = numberOrText(row[names::kId]);
  shown.removeMember(names::kEnable);
  shown["enabled"] = row[names::kEnable] == "1";
  mask(shown, secrets, {names::kClientSecret});
  markUndecrypted(shown, row, {names::kClientId, names::kClientSecret});
  return shown;
}

Json::Value presentCode(const Json::Value& row, Secrets secrets) {
  Json::Value shown = row;
  shown[names::kId] = numberOrText(row[names::kId]);
  presentExpiry(shown, isExpiredCode);
  mask(shown, secrets, {names::kCode});
  markUndecrypted(shown, row, {names::kClientId});
  return shown;
}

Json::Value presentToken(const Json::Value& row, Secrets secrets) {
  Json::Value shown = row;
  shown[names::kId] = numberOrText(row[names::kId]);
  presentExpiry(shown, isExpiredToken);
  mask(shown, secrets, {names::kAccessToken, names::kRefreshToken});
  markUndecrypted(shown, row, {names::kClientId});
  return shown;
}

Json::Value presentLogEntry(const Json::Value& row) {
  Json::Value shown = row;
  shown[names::kId] = numberOrText(row[names::kId]);
  shown[names::kTimestamp] = numberOrText(row[names::kTimestamp]);
  shown["time"] = timeOrNull(numberIn(row[names::kTimestamp]));
  return shown;
}

long long expiryOf(const Json::Value& row) {
  return numberIn(row[names::kExpiredTime]);
}

long long idOf(const Json::Value& row) {
  return numberIn(row[names::kId]);
}

bool isExpiredCode(long long expiry, long long now) {
  return expiry <= now;
}

bool isExpiredToken(long long expiry, long long now) {
  return expiry < now;
}

std::string readableIdentifier(const Json::Value& row) {
  std::string identifier = row[names::kClientId].asString();
  if (isDecrypted(identifier)) return identifier;
  throw Failure(kUnavailable,
                "client " + row[names::kId].asString() + ": its identifier cannot be decrypted",
                adviceOnCipher());
}

std::string identifierText(const Json::Value& row) {
  return decryptedText(row, names::kClientId);
}

std::string secretText(const Json::Value& row) {
  return decryptedText(row, names::kClientSecret);
}

std::string expiryText(const Json::Value& row) {
  const Json::Value& time = row["expires_at"];
  return time.isNull() ? row[names::kExpiredTime].asString() : time.asString();
}

std::string remainingText(const Json::Value& row) {
  if (row["expired"].asBool()) return "expired";
  return duration(numberIn(row[names::kExpiredTime]) - currentTime());
}

std::string expiryAndRemainingText(const Json::Value& row) {
  return expiryText(row) + (row["expired"].asBool() ? ", " : ", in ") + remainingText(row);
}

}  // namespace tool
