#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <string>
#include <string_view>

#include "grants/audit.h"

namespace KELDOAUTHSERVER::grants {
namespace {

struct Range {
  std::uint32_t first;
  std::uint32_t last;
};

/// Not shown, shown as a blank, or turning the direction of what is shown:
/// control, format and separator characters, fillers, selectors and tags.
constexpr std::array<Range, 37> kHidden{{
    {0x0000, 0x001f},    {0x005c, 0x005c},   {0x007f, 0x00a0},   {0x00ad, 0x00ad},
    {0x034f, 0x034f},    {0x0600, 0x0605},   {0x061c, 0x061c},   {0x06dd, 0x06dd},
    {0x070f, 0x070f},    {0x0890, 0x0891},   {0x08e2, 0x08e2},   {0x115f, 0x1160},
    {0x1680, 0x1680},    {0x17b4, 0x17b5},   {0x180b, 0x180f},   {0x2000, 0x200f},
    {0x2028, 0x202f},    {0x205f, 0x206f},   {0x2800, 0x2800},   {0x3000, 0x3000},
    {0x3164, 0x3164},    {0xe000, 0xf8ff},   {0xfe00, 0xfe0f},   {0xfeff, 0xfeff},
    {0xffa0, 0xffa0},    {0xfff0, 0xffff},   {0x110bd, 0x110bd}, {0x110cd, 0x110cd},
    {0x13430, 0x1343f},  {0x16fe4, 0x16fe4}, {0x1bca0, 0x1bca3}, {0x1d159, 0x1d159},
    {0x1d173, 0x1d17a},  {0x1fffe, 0x1ffff}, {0x2fffe, 0x2ffff}, {0x3fffe, 0xe0fff},
    {0xe1000, 0x10ffff},
}};

bool isHidden(std::uint32_t point) {
  return std::any_of(kHidden.begin(), kHidden.end(), [point](const Range& range) {
    return point >= range.first && point <= range.last;
  });
}

struct Character {
  std::uint32_t point;
  std::size_t length;  // bytes; 0 when they are not UTF-8
};

constexpr std::uint32_t kSurrogates = 0xd800;
constexpr std::uint32_t kLastSurrogate = 0xdfff;
constexpr std::uint32_t kLastPoint = 0x10ffff;

std::size_t lengthOf(unsigned char lead) {
  if (lead < 0x80) return 1;
  if (lead < 0xc2) return 0;
  if (lead < 0xe0) return 2;
  if (lead < 0xf0) return 3;
  return lead < 0xf5 ? 4 : 0;
}

/// The character at the start of `text`, which is not empty (RFC 3629).
Character firstOf(std::string_view text) {
  constexpr std::array<std::uint32_t, 5> kLeast{0, 0, 0x80, 0x800, 0x10000};
  constexpr std::array<unsigned, 5> kLeadBits{0, 0x7f, 0x1f, 0x0f, 0x07};
  const auto lead = static_cast<unsigned char>(text.front());
  const std::size_t length = lengthOf(lead);
  if (length == 0 || length > text.size()) return {lead, 0};
  std::uint32_t point = lead & kLeadBits.at(length);
  for (std::size_t i = 1; i < length; ++i) {
    const auto next = static_cast<unsigned char>(text[i]);
    if ((next & 0xc0U) != 0x80U) return {lead, 0};
    point = point << 6U | (next & 0x3fU);
  }
  const bool isSurrogate = point >= kSurrogates && point <= kLastSurrogate;
  if (point < kLeast.at(length) || isSurrogate || point > kLastPoint) return {lead, 0};
  return {point, length};
}

std::string escaped(const char* format, std::uint32_t number) {
  std::array<char, 16> text{};
  std::snprintf(text.data(), text.size(), format, static_cast<unsigned>(number));
  return text.data();
}

std::string shown(const Character& character, std::string_view bytes) {
  if (character.length == 0 || character.point < 0x80) {
    if (character.point == '[') return "(";
    if (character.point == ']') return ")";
    if (character.length == 0 || isHidden(character.point)) {
      return escaped("\\x%02x", character.point);
    }
  } else if (isHidden(character.point)) {
    return escaped("\\u{%x}", character.point);
  }
  return std::string(bytes);
}

}  // namespace

std::string harmless(const std::string& text) {
  std::string all;
  for (std::string_view rest = text; !rest.empty();) {
    const Character character = firstOf(rest);
    const std::size_t length = std::max<std::size_t>(character.length, 1);
    all += shown(character, rest.substr(0, length));
    rest.remove_prefix(length);
  }
  return all;
}

}  // namespace KELDOAUTHSERVER::grants
