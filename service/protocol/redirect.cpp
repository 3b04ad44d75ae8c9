#include "service/protocol/redirect.h"

#include <algorithm>
#include <cctype>
#include <string_view>

namespace keldoauth::service {
namespace {

constexpr std::string_view kHttps = "https://";
constexpr std::string_view kHttp = "http://";

bool startsWith(std::string_view text, std::string_view start) {
  return text.substr(0, start.size()) == start;
}

std::string_view schemeOf(std::string_view address) {
  if (startsWith(address, kHttps)) return kHttps;
  return startsWith(address, kHttp) ? kHttp : std::string_view();
}

/// Host and port of an address without a scheme.
std::string_view authorityOf(std::string_view rest) {
  return rest.substr(0, rest.find_first_of("/?"));
}

/// The host; empty when the authority is not of the form host[:port].
std::string_view hostOf(std::string_view authority) {
  const bool bracketed = !authority.empty() && authority.front() == '[';
  const std::size_t from = bracketed ? authority.find(']') : 0;
  if (from == std::string_view::npos) return {};

  const std::size_t colon = authority.find(':', from);
  const std::string_view host = authority.substr(0, colon);
  if (bracketed && host.size() != from + 1) return {};
  if (colon == std::string_view::npos) return host;

  const std::string_view port = authority.substr(colon + 1);
  const bool valid = !port.empty() && port.size() <= 5 &&
                     port.find_first_not_of("0123456789") == std::string_view::npos;
  return valid ? host : std::string_view();
}

bool isHost(std::string_view host) {
  constexpr std::string_view kName =
      "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789-._";
  constexpr std::string_view kLiteral = "[]:.0123456789abcdefABCDEF";
  if (host.empty()) return false;
  const std::string_view allowed = host.front() == '[' ? kLiteral : kName;
  return host.find_first_not_of(allowed) == std::string_view::npos;
}

bool isLoopback(std::string_view host) {
  return host == "127.0.0.1" || host == "[::1]" || host == "localhost";
}

/// Printable ASCII but for what RFC 3986 leaves out, and for the fragment.
bool isAddressCharacter(char c) {
  constexpr std::string_view kRefused = "\"<>\\^`{|}#";
  return c > ' ' && c < '\x7f' && kRefused.find(c) == std::string_view::npos;
}

std::string withScheme(const std::string& stored) {
  if (!schemeOf(stored).empty()) return stored;
  const bool loopback = isLoopback(hostOf(authorityOf(stored)));
  return std::string(loopback ? kHttp : kHttps) + stored;
}

}  // namespace

bool isRedirectAddress(const std::string& address) {
  const std::string_view scheme = schemeOf(address);
  if (scheme.empty() || !std::all_of(address.begin(), address.end(), isAddressCharacter)) {
    return false;
  }
  const std::string_view host =
      hostOf(authorityOf(std::string_view(address).substr(scheme.size())));
  return isHost(host) && (scheme == kHttps || isLoopback(host));
}

bool isRegistered(const std::string& address, const Addresses& registered) {
  if (!isRedirectAddress(address)) return false;
  const std::string rest = address.substr(schemeOf(address).size());
  return std::any_of(registered.begin(), registered.end(),
                     [&](const grants::RedirectAddress& entry) {
                       return entry.text() == (schemeOf(entry.text()).empty() ? rest : address);
                     });
}

std::string onlyAddress(const Addresses& registered) {
  if (registered.size() != 1) return {};
  const std::string address = withScheme(registered[0].text());
  return isRedirectAddress(address) ? address : std::string();
}

std::string originOf(const std::string& address) {
  const std::string_view scheme = schemeOf(address);
  const std::string_view rest = std::string_view(address).substr(scheme.size());
  return std::string(scheme) + std::string(authorityOf(rest));
}

}  // namespace keldoauth::service
