#include "service/protocol/redirect.h"

#include <arpa/inet.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <optional>
#include <string_view>

namespace keldoauth::service {
namespace {

constexpr std::string_view kHttps = "https://";
constexpr std::string_view kHttp = "http://";

/// An address of the web, taken apart: scheme, host, port and the rest.
struct Parts {
  std::string_view scheme;
  std::string_view host;
  std::string_view port;  // empty: the scheme's own
  std::string_view rest;  // path and query
};

bool startsWith(std::string_view text, std::string_view start) {
  return text.substr(0, start.size()) == start;
}

std::string_view schemeOf(std::string_view address) {
  if (startsWith(address, kHttps)) return kHttps;
  return startsWith(address, kHttp) ? kHttp : std::string_view();
}

bool isLetter(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

bool isDigit(char c) {
  return c >= '0' && c <= '9';
}

bool isPort(std::string_view text) {
  unsigned short port = 0;
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, port);
  return error == std::errc() && stop == end && port != 0;
}

bool isHost(std::string_view host) {
  if (host.empty()) return false;
  if (host.front() == '[') {
    std::array<unsigned char, sizeof(in6_addr)> bytes{};
    const std::string literal(host.substr(1, host.size() - 2));
    return host.back() == ']' && inet_pton(AF_INET6, literal.c_str(), bytes.data()) == 1;
  }
  const auto isOfName = [](char c) {
    return isLetter(c) || isDigit(c) || c == '-' || c == '.' || c == '_';
  };
  return host.front() != '.' && host.front() != '-' &&
         std::all_of(host.begin(), host.end(), isOfName);
}

bool isLoopback(std::string_view host) {
  return host == "127.0.0.1" || host == "[::1]" || host == "localhost";
}

/// Nothing when host or port are none. `scheme` is at its start, or nowhere.
std::optional<Parts> partsOf(std::string_view address, std::string_view scheme) {
  if (startsWith(address, scheme)) address.remove_prefix(scheme.size());
  const std::string_view authority = address.substr(0, address.find_first_of("/?"));
  const std::size_t bracket = authority.rfind(']');
  const std::size_t colon = authority.find(':', bracket == std::string_view::npos ? 0 : bracket);
  const Parts parts{
      scheme, authority.substr(0, colon),
      colon == std::string_view::npos ? std::string_view() : authority.substr(colon + 1),
      address.substr(authority.size())};
  if (!isHost(parts.host)) return std::nullopt;
  if (colon != std::string_view::npos && !isPort(parts.port)) return std::nullopt;
  return parts;
}

bool isLoopback(const Parts& parts) {
  return parts.scheme == kHttp && isLoopback(parts.host);
}

/// Printable ASCII but for what RFC 3986 leaves out, and for the fragment.
bool isAddressCharacter(char c) {
  constexpr std::string_view kRefused = "\"<>\\^`{|}#";
  return c > ' ' && c < '\x7f' && kRefused.find(c) == std::string_view::npos;
}

/// What stands behind percent signs can be read, and is no control character.
bool isDecodable(std::string_view text) {
  for (std::size_t at = text.find('%'); at != std::string_view::npos; at = text.find('%', at + 1)) {
    unsigned value = 0;
    const std::string_view digits = text.substr(at + 1, 2);
    const auto [stop, error] =
        std::from_chars(digits.data(), digits.data() + digits.size(), value, 16);
    if (error != std::errc() || stop - digits.data() != 2) return false;
    if (value < ' ' || value == 0x7f) return false;
  }
  return true;
}

/// A scheme that belongs to whom the domain does: with a dot in it, and so none
/// that a browser knows. It has no authority, and no user either.
bool isPrivateUse(std::string_view address) {
  const std::size_t colon = address.find(':');
  if (colon == std::string_view::npos || address.substr(colon + 1, 1) != "/") return false;
  const std::string_view scheme = address.substr(0, colon);
  const auto isOfScheme = [](char c) {
    return isLetter(c) || isDigit(c) || c == '-' || c == '.' || c == '+';
  };
  return !scheme.empty() && isLetter(scheme.front()) && scheme.back() != '.' &&
         std::all_of(scheme.begin(), scheme.end(), isOfScheme) &&
         scheme.find('.') != std::string_view::npos &&
         scheme.find("..") == std::string_view::npos && address.find('@') == std::string_view::npos;
}

std::string withScheme(const std::string& stored) {
  const std::optional<Parts> parts = partsOf(stored, "");
  if (!schemeOf(stored).empty() || !parts) return stored;
  return std::string(isLoopback(parts->host) ? kHttp : kHttps) + stored;
}

/// The same but for the port, which the application had from its system.
bool isSameOnLoopback(const std::string& address, const std::string& entry) {
  const std::optional<Parts> asked = partsOf(address, schemeOf(address));
  const std::string_view scheme = schemeOf(entry);
  const std::optional<Parts> known = partsOf(entry, scheme.empty() ? kHttp : scheme);
  return asked && known && isLoopback(*asked) && isLoopback(*known) && asked->host == known->host &&
         asked->rest == known->rest;
}

}  // namespace

AddressForm formOf(const std::string& address) {
  if (!std::all_of(address.begin(), address.end(), isAddressCharacter) || !isDecodable(address)) {
    return AddressForm::kNone;
  }
  const std::string_view scheme = schemeOf(address);
  if (scheme.empty()) return isPrivateUse(address) ? AddressForm::kPrivateUse : AddressForm::kNone;
  const std::optional<Parts> parts = partsOf(address, scheme);
  if (!parts) return AddressForm::kNone;
  if (scheme == kHttps) return AddressForm::kWeb;
  return isLoopback(*parts) ? AddressForm::kLoopback : AddressForm::kNone;
}

bool isRedirectAddress(const std::string& address, grants::ApplicationKind kind) {
  const AddressForm form = formOf(address);
  return form == AddressForm::kWeb || form == AddressForm::kLoopback ||
         (form == AddressForm::kPrivateUse && kind == grants::ApplicationKind::kPublic);
}

bool isRegistered(const std::string& address, const Addresses& registered,
                  grants::ApplicationKind kind) {
  if (!isRedirectAddress(address, kind)) return false;
  const std::string rest = address.substr(schemeOf(address).size());
  return std::any_of(registered.begin(), registered.end(),
                     [&](const grants::RedirectAddress& entry) {
                       const std::string& known = entry.text();
                       return known == (schemeOf(known).empty() ? rest : address) ||
                              isSameOnLoopback(address, known);
                     });
}

std::string onlyAddress(const Addresses& registered, grants::ApplicationKind kind) {
  if (registered.size() != 1) return {};
  const std::string address = withScheme(registered[0].text());
  return isRedirectAddress(address, kind) ? address : std::string();
}

std::string originOf(const std::string& address) {
  const std::size_t scheme = schemeOf(address).size();
  if (scheme == 0) return address.substr(0, address.find(':') + 1);
  return address.substr(0, address.find_first_of("/?", scheme));
}

}  // namespace keldoauth::service
