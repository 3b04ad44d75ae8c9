#include "grants/rows/registry_words.h"

#include <cstddef>

#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER::grants::rows {
namespace {

constexpr std::string_view kNone = "(none)";
constexpr std::string_view kPkceOptional = "(pkce-optional)";
constexpr std::string_view kSelf = "(self)";
constexpr std::string_view kEs256 = "(es256)";
constexpr std::string_view kLogout = "(logout:";

void append(std::string& text, std::string_view word) {
  if (!text.empty()) text += ' ';
  text += word;
}

bool isLogout(std::string_view word) {
  return word.size() > kLogout.size() && word.substr(0, kLogout.size()) == kLogout &&
         word.back() == ')';
}

void take(std::string_view word, RegistryWords& words) {
  if (word.empty() || word == kNone) return;
  if (word == kPkceOptional) {
    words.isPkceOptional = true;
  } else if (word == kSelf) {
    words.registeredItself = true;
  } else if (word == kEs256) {
    words.wantsEs256 = true;
  } else if (isLogout(word)) {
    words.logoutAddresses.emplace_back(
        word.substr(kLogout.size(), word.size() - kLogout.size() - 1));
  } else if (word.front() == '(') {
    words.others.emplace_back(word);
  } else {
    words.addresses.emplace_back(word);
  }
}

}  // namespace

std::string pack(const RegistryWords& words) {
  std::string text;
  for (const std::string& address : words.addresses) append(text, address);
  if (words.addresses.empty()) append(text, kNone);
  if (words.isPkceOptional) append(text, kPkceOptional);
  if (words.registeredItself) append(text, kSelf);
  if (words.wantsEs256) append(text, kEs256);
  for (const std::string& address : words.logoutAddresses) {
    append(text, std::string(kLogout) + address + ")");
  }
  for (const std::string& other : words.others) append(text, other);
  return text;
}

RegistryWords unpackWords(std::string_view text) {
  RegistryWords words{};
  while (!text.empty()) {
    const std::size_t blank = text.find(' ');
    take(text.substr(0, blank), words);
    text.remove_prefix(blank == std::string_view::npos ? text.size() : blank + 1);
  }
  return words;
}

std::string selfCondition() {
  return "(instr(' '||" + std::string(names::kRedirectUri) + "||' ',' " + std::string(kSelf) +
         " ')>0)";
}

}  // namespace KELDOAUTHSERVER::grants::rows
