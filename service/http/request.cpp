#include "service/http/request.h"

#include <algorithm>

#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

/// -1 for no hexadecimal digit.
int hexValue(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  const char letter = lowerCase(c);
  return letter >= 'a' && letter <= 'f' ? letter - 'a' + 10 : -1;
}

}  // namespace

std::optional<std::string> formDecode(std::string_view text) {
  std::string decoded;
  decoded.reserve(text.size());
  for (std::size_t i = 0; i < text.size(); ++i) {
    char c = text[i] == '+' ? ' ' : text[i];
    if (c == '%') {
      if (text.size() - i < 3) return std::nullopt;
      const int high = hexValue(text[i + 1]);
      const int low = hexValue(text[i + 2]);
      if (high < 0 || low < 0) return std::nullopt;
      c = static_cast<char>(high * 16 + low);
      i += 2;
    }
    if (c == '\0') return std::nullopt;
    decoded += c;
  }
  return decoded;
}

bool equalWords(std::string_view a, std::string_view b) {
  return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                    [](char x, char y) { return lowerCase(x) == lowerCase(y); });
}

std::optional<std::string> bearerToken(const std::string& header) {
  const std::size_t blank = std::min(header.find(' '), header.size());
  if (!equalWords(header.substr(0, blank), "Bearer")) return std::nullopt;
  return header.substr(std::min(header.find_first_not_of(' ', blank), header.size()));
}

std::optional<Parameters> Parameters::parse(std::string_view text) {
  Parameters parameters;
  while (!text.empty()) {
    const std::string_view pair = text.substr(0, text.find('&'));
    text.remove_prefix(std::min(text.size(), pair.size() + 1));
    if (pair.empty()) continue;

    const std::size_t equals = std::min(pair.find('='), pair.size());
    std::optional<std::string> name = formDecode(pair.substr(0, equals));
    std::optional<std::string> value = formDecode(pair.substr(std::min(equals + 1, pair.size())));
    if (!name || !value || parameters.pairs_.size() == kMaxParameters) return std::nullopt;
    parameters.pairs_.emplace_back(std::move(*name), std::move(*value));
  }
  return parameters;
}

std::string Parameters::value(std::string_view name) const {
  for (const auto& [key, value] : pairs_) {
    if (key == name) return value;
  }
  return {};
}

std::vector<std::string> Parameters::values(std::string_view name) const {
  std::vector<std::string> values;
  for (const auto& [key, value] : pairs_) {
    if (key == name && !value.empty()) values.push_back(value);
  }
  return values;
}

std::string Parameters::textWithout(std::initializer_list<std::string_view> names) const {
  std::string text;
  for (const auto& [key, value] : pairs_) {
    if (std::find(names.begin(), names.end(), key) != names.end()) continue;
    if (!text.empty()) text += '&';
    text += percentEncode(key) + "=" + percentEncode(value);
  }
  return text;
}

bool Parameters::isDoubled(std::string_view name) const {
  return std::count_if(pairs_.begin(), pairs_.end(),
                       [&](const auto& pair) { return pair.first == name; }) > 1;
}

bool Parameters::isAnyDoubled(std::initializer_list<std::string_view> names) const {
  return std::any_of(names.begin(), names.end(),
                     [this](std::string_view name) { return isDoubled(name); });
}

}  // namespace keldoauth::service
