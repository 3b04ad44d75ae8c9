#include "service/http/cookies.h"

#include <algorithm>

namespace keldoauth::service {
namespace {

constexpr std::string_view kBlanks = " \t";

std::string nameFor(const Request& request, std::string_view name) {
  return (request.isSecure ? "__Host-" : "") + std::string(name);
}

std::string_view stripped(std::string_view text) {
  text.remove_prefix(std::min(text.find_first_not_of(kBlanks), text.size()));
  return text.substr(0, text.find_last_not_of(kBlanks) + 1);
}

std::string header(const Request& request, std::string_view name, const std::string& value) {
  return nameFor(request, name) + "=" + value + "; Path=/" + (request.isSecure ? "; Secure" : "") +
         "; HttpOnly; SameSite=Lax";
}

}  // namespace

std::optional<std::string> cookieValue(const Request& request, std::string_view name) {
  const std::string wanted = nameFor(request, name);
  std::optional<std::string> value;
  for (std::string_view rest = request.cookie; !rest.empty();) {
    const std::string_view pair = stripped(rest.substr(0, rest.find(';')));
    rest.remove_prefix(std::min(rest.find(';'), rest.size() - 1) + 1);
    const std::size_t equals = pair.find('=');
    if (equals == std::string_view::npos || stripped(pair.substr(0, equals)) != wanted) continue;
    if (value) return std::nullopt;
    value = stripped(pair.substr(equals + 1));
  }
  return value ? value : std::string();
}

std::string cookieToSet(const Request& request, std::string_view name, const std::string& value,
                        long seconds) {
  const std::string text = header(request, name, value);
  return seconds == 0 ? text : text + "; Max-Age=" + std::to_string(seconds);
}

std::string cookieToForget(const Request& request, std::string_view name) {
  return header(request, name, "") + "; Max-Age=0";
}

}  // namespace keldoauth::service
