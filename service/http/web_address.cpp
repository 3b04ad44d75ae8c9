#include "service/http/web_address.h"

#include <algorithm>

namespace keldoauth::service {
namespace {

constexpr std::string_view kDigits = "0123456789";
constexpr std::string_view kHostCharacters = "abcdefghijklmnopqrstuvwxyz0123456789-.";
constexpr std::string_view kLiteralCharacters = ":.0123456789abcdef";
constexpr std::string_view kPathCharacters =
    "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789-._~!$&'()*+,;=:@/";

bool takeStart(std::string_view& text, std::string_view start) {
  if (text.substr(0, start.size()) != start) return false;
  text.remove_prefix(start.size());
  return true;
}

bool isMadeOf(std::string_view text, std::string_view characters) {
  return text.find_first_not_of(characters) == std::string_view::npos;
}

bool isPort(std::string_view text) {
  return !text.empty() && text.size() <= 5 && isMadeOf(text, kDigits);
}

/// Up to the port, the path or the end.
std::string_view hostAt(std::string_view text) {
  if (text.substr(0, 1) != "[") return text.substr(0, text.find_first_of(":/"));
  return text.substr(0, std::min(text.find(']'), text.size() - 1) + 1);
}

bool isHost(std::string_view host) {
  const std::size_t size = host.size();
  if (size > 2 && host.front() == '[' && host.back() == ']') {
    return isMadeOf(host.substr(1, size - 2), kLiteralCharacters);
  }
  return size != 0 && isMadeOf(host, kHostCharacters);
}

}  // namespace

std::optional<WebAddress> readWebAddress(std::string_view text) {
  WebAddress address;
  address.isSecure = takeStart(text, "https://");
  if (!address.isSecure && !takeStart(text, "http://")) return std::nullopt;

  address.host = hostAt(text);
  text.remove_prefix(address.host.size());
  if (!isHost(address.host)) return std::nullopt;
  if (takeStart(text, ":")) {
    address.port = text.substr(0, text.find('/'));
    text.remove_prefix(address.port.size());
    if (!isPort(address.port)) return std::nullopt;
  }
  address.path = text;
  const bool isPath = text.empty() || (text.front() == '/' && isMadeOf(text, kPathCharacters));
  return isPath ? std::optional(address) : std::nullopt;
}

bool isLoopbackHost(std::string_view host) {
  return host == "127.0.0.1" || host == "[::1]" || host == "localhost";
}

bool isLoopbackPeer(std::string_view peer) {
  takeStart(peer, "::ffff:");
  return peer == "::1" || peer.substr(0, 4) == "127.";
}

}  // namespace keldoauth::service
