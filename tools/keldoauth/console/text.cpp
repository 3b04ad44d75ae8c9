#include "tools/keldoauth/console/text.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <cwchar>
#include <cwctype>
#include <string_view>

namespace tool {
namespace {

constexpr std::string_view kEllipsis = "…";

/// The character that a text begins with. A byte that begins none stands for
/// itself, with `isValid` false.
struct Character {
  wchar_t code = 0;
  std::size_t bytes = 1;
  bool isValid = false;
};

Character firstCharacter(std::string_view text) {
  Character found;
  std::mbstate_t state{};
  const std::size_t length = std::mbrtowc(&found.code, text.data(), text.size(), &state);
  found.isValid = length != static_cast<std::size_t>(-1) && length != static_cast<std::size_t>(-2);
  if (found.isValid) found.bytes = std::max<std::size_t>(length, 1);  // NUL has length 0
  return found;
}

/// Printable by the locale's word, but without a shape of their own: they would
/// reorder or hide what stands around them. Joiners stay: scripts need them.
bool isDeceptive(wchar_t code) {
  struct Range {
    wchar_t first;
    wchar_t last;
  };
  constexpr std::array<Range, 7> kRanges{{{0x00AD, 0x00AD},
                                          {0x061C, 0x061C},
                                          {0x200B, 0x200B},
                                          {0x200E, 0x200F},
                                          {0x2028, 0x202E},
                                          {0x2060, 0x206F},
                                          {0xFEFF, 0xFEFF}}};
  return std::any_of(kRanges.begin(), kRanges.end(), [code](const Range& range) {
    return range.first <= code && code <= range.last;
  });
}

template <typename Value>
std::string formatted(const char* format, Value value) {
  std::array<char, 16> buffer{};
  std::snprintf(buffer.data(), buffer.size(), format, value);
  return buffer.data();
}

std::string escaped(const Character& character, char firstByte) {
  switch (firstByte) {
    case '\n':
      return "\\n";
    case '\r':
      return "\\r";
    case '\t':
      return "\\t";
    default:
      break;
  }
  if (character.isValid && character.bytes > 1) {
    return formatted("\\u{%x}", static_cast<unsigned int>(character.code));
  }
  return formatted("\\x%02x", static_cast<unsigned char>(firstByte));
}

bool isShown(const Character& character) {
  return character.isValid && std::iswprint(static_cast<std::wint_t>(character.code)) != 0 &&
         !isDeceptive(character.code);
}

std::size_t widthOf(const Character& character) {
  return static_cast<std::size_t>(std::max(wcwidth(character.code), 0));
}

/// The bytes of the characters that have room, one at least.
std::size_t bytesWithin(std::string_view text, std::size_t width) {
  std::size_t used = 0;
  std::size_t bytes = 0;
  while (bytes < text.size()) {
    const Character character = firstCharacter(text.substr(bytes));
    used += widthOf(character);
    if (used > width && bytes > 0) break;
    bytes += character.bytes;
  }
  return bytes;
}

}  // namespace

std::string printable(const std::string& text) {
  std::string shown;
  for (std::string_view rest = text; !rest.empty();) {
    const Character character = firstCharacter(rest);
    if (isShown(character)) {
      shown += rest.substr(0, character.bytes);
    } else {
      shown += escaped(character, rest.front());
    }
    rest.remove_prefix(character.bytes);
  }
  return shown;
}

std::size_t displayWidth(const std::string& text) {
  std::size_t width = 0;
  for (std::string_view rest = text; !rest.empty();) {
    const Character character = firstCharacter(rest);
    width += widthOf(character);
    rest.remove_prefix(character.bytes);
  }
  return width;
}

std::vector<std::string> wrapped(const std::string& text, std::size_t width) {
  std::vector<std::string> lines;
  std::string_view rest = text;
  do {
    std::size_t end = bytesWithin(rest, width);
    const std::size_t blank = end < rest.size() ? rest.rfind(' ', end) : std::string_view::npos;
    const bool hasBlank = blank != std::string_view::npos && blank > 0;
    if (hasBlank) end = blank;
    lines.emplace_back(rest.substr(0, end));
    rest.remove_prefix(hasBlank ? end + 1 : end);
  } while (!rest.empty());
  return lines;
}

std::string fitted(const std::string& text, std::size_t width) {
  if (displayWidth(text) <= width) return text;

  std::string_view rest = text;
  std::size_t used = 1;  // the ellipsis
  while (!rest.empty()) {
    const Character character = firstCharacter(rest);
    if (used + widthOf(character) > width) break;
    used += widthOf(character);
    rest.remove_prefix(character.bytes);
  }
  return text.substr(0, text.size() - rest.size()).append(kEllipsis);
}

std::string masked(const std::string& secret) {
  constexpr std::size_t kShown = 6;
  constexpr std::size_t kShortest = 4 * kShown;
  const auto isPlain = [](char c) { return ' ' < c && c <= '~'; };
  const bool showsStart =
      secret.size() >= kShortest && std::all_of(secret.begin(), secret.begin() + kShown, isPlain);
  return (showsStart ? secret.substr(0, kShown) : std::string()).append(kEllipsis);
}

}  // namespace tool
