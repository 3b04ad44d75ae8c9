#include "tools/keldoauth/rows.h"

#include <charconv>
#include <initializer_list>
#include <system_error>

#include "tools/keldoauth/clock.h"
#include "tools/keldoauth/stores.h"
#include "tools/keldoauth/text.h"
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

template <typename Store>
void presentExpiry(Json::Value& row) {
  const long long expiry = numberIn(row[names::kExpiredTime]);
  row["expires_at"] = timeOrNull(expiry);
  row["expired"] = Store::isExpired(expiry, currentTime());
  row[names::kExpiredTime] = numberOrText(row[names::kExpiredTime]);
}

}  // namespace

Json::Value presentClient(const Json::Value& row, Secrets secrets) {
  Json::Value shown = row;
  shown[names::kId] = numberOrText(row[names::kId]);
  shown.removeMember(names::kEnable);
  shown["enabled"] = row[names::kEnable] == "1";
  mask(shown, secrets, {names::kClientSecret});
  return shown;
}

Json::Value presentCode(const Json::Value& row, Secrets secrets) {
  Json::Value shown = row;
  shown[names::kId] = numberOrText(row[names::kId]);
  presentExpiry<Codes>(shown);
  mask(shown, secrets, {names::kCode});
  return shown;
}

Json::Value presentToken(const Json::Value& row, Secrets secrets) {
  Json::Value shown = row;
  shown[names::kId] = numberOrText(row[names::kId]);
  presentExpiry<Tokens>(shown);
  mask(shown, secrets, {names::kAccessToken, names::kRefreshToken});
  return shown;
}

Json::Value presentLogEntry(const Json::Value& row) {
  Json::Value shown = row;
  shown[names::kId] = numberOrText(row[names::kId]);
  shown[names::kTimestamp] = numberOrText(row[names::kTimestamp]);
  shown["time"] = timeOrNull(numberIn(row[names::kTimestamp]));
  return shown;
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
