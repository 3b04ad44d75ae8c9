#include "grants/rows/checks.h"

#include <arpa/inet.h>
#include <net/if.h>

#include <algorithm>
#include <array>
#include <set>

namespace KELDOAUTHSERVER::grants::rows {
namespace {

constexpr Bounds kPeerScope{0, IF_NAMESIZE - 1};
constexpr long long kLongestLifetime = 100LL * 365 * 24 * 60 * 60;

bool isAlpha(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

bool isOf(char c, std::string_view others) {
  return isAlpha(c) || (c >= '0' && c <= '9') || others.find(c) != std::string_view::npos;
}

bool areOf(std::string_view text, std::string_view others) {
  return std::all_of(text.begin(), text.end(), [others](char c) { return isOf(c, others); });
}

bool isNumeric(int family, const std::string& text) {
  std::array<unsigned char, sizeof(in6_addr)> address{};
  return inet_pton(family, text.c_str(), address.data()) == 1;
}

std::set<std::string_view> namesOf(std::string_view scope) {
  std::set<std::string_view> names;
  while (!scope.empty()) {
    const std::string_view name = scope.substr(0, scope.find(' '));
    if (!name.empty()) names.insert(name);
    scope.remove_prefix(std::min(scope.size(), name.size() + 1));
  }
  return names;
}

}  // namespace

bool hasNul(std::string_view text) {
  return text.find('\0') != std::string_view::npos;
}

bool isWithin(std::string_view text, const Bounds& bounds) {
  return text.size() >= static_cast<std::size_t>(bounds.min) &&
         text.size() <= static_cast<std::size_t>(bounds.max);
}

std::optional<Why> faultOf(std::initializer_list<Bounded> texts) {
  for (const Bounded& bounded : texts) {
    if (hasNul(bounded.text)) return Why::kHasNul;
    if (!isWithin(bounded.text, bounded.bounds)) return Why::kOutOfBounds;
  }
  return {};
}

bool isPeer(const std::string& text) {
  if (text.empty() || isNumeric(AF_INET, text)) return !hasNul(text);
  const std::size_t percent = text.find('%');
  if (percent != std::string::npos) {
    const std::string_view scope = std::string_view(text).substr(percent + 1);
    if (!isWithin(scope, kPeerScope) || !areOf(scope, "-._")) return false;
  }
  return !hasNul(text) && isNumeric(AF_INET6, text.substr(0, percent));
}

bool isAddress(std::string_view text) {
  constexpr std::string_view kRefused = "\"<>\\^`{|}";
  const std::size_t colon = text.find(':');
  return colon != std::string_view::npos && isAlpha(text.front()) &&
         areOf(text.substr(0, colon), "+-.") && colon + 1 < text.size() && isVisible(text) &&
         text.find_first_of(kRefused) == std::string_view::npos;
}

bool isIdentifier(std::string_view text) {
  return isWithin(text, bounds::kIdentifier) && areOf(text, "-._~");
}

bool isVisible(std::string_view text) {
  return std::all_of(text.begin(), text.end(), [](char c) { return c > ' ' && c < '\x7f'; });
}

bool isScopeWithin(std::string_view scope, std::string_view granted) {
  const std::set<std::string_view> asked = namesOf(scope);
  const std::set<std::string_view> most = namesOf(granted);
  return !asked.empty() && std::includes(most.begin(), most.end(), asked.begin(), asked.end());
}

bool isLifetime(const std::optional<long long>& seconds) {
  return !seconds || (*seconds >= 1 && *seconds <= kLongestLifetime);
}

}  // namespace KELDOAUTHSERVER::grants::rows
