#include "grants/rows/refresh_text.h"

#include <charconv>
#include <cstddef>
#include <cstdint>
#include <limits>

#include "grants/rows/digest.h"

namespace KELDOAUTHSERVER::grants::rows {
namespace {

constexpr char kVersion = '1';
constexpr int kBase = 16;
constexpr std::size_t kRowDigits = 16;
constexpr std::size_t kSecretDigits = 40;
constexpr std::size_t kCheckDigits = 8;
constexpr std::size_t kFamilyAt = 1 + kRowDigits;
constexpr std::size_t kSecretAt = kFamilyAt + kSecretDigits;
constexpr std::size_t kCheckAt = kSecretAt + kSecretDigits;
constexpr std::size_t kLength = kCheckAt + kCheckDigits;

std::string checkOf(std::string_view text) {
  return hexDigest(text).substr(0, kCheckDigits);
}

std::string rowDigits(long long row) {
  std::string digits;
  for (auto rest = static_cast<std::uint64_t>(row); digits.size() < kRowDigits; rest /= kBase) {
    digits.insert(digits.begin(), "0123456789abcdef"[rest % kBase]);
  }
  return digits;
}

}  // namespace

RefreshText firstOf(long long row) {
  return {row, randomDigits(kSecretDigits), randomDigits(kSecretDigits)};
}

RefreshText nextOf(const RefreshText& token) {
  return {token.row, token.family, randomDigits(kSecretDigits)};
}

std::string write(const RefreshText& token) {
  const std::string text = kVersion + rowDigits(token.row) + token.family + token.secret;
  return text + checkOf(text);
}

std::optional<RefreshText> read(std::string_view text) {
  if (text.size() != kLength || text.front() != kVersion ||
      text.find_first_not_of("0123456789abcdef") != std::string_view::npos ||
      checkOf(text.substr(0, kCheckAt)) != text.substr(kCheckAt)) {
    return {};
  }
  std::uint64_t row = 0;
  std::from_chars(text.data() + 1, text.data() + kFamilyAt, row, kBase);
  if (row > static_cast<std::uint64_t>(std::numeric_limits<long long>::max())) return {};
  return RefreshText{static_cast<long long>(row),
                     std::string(text.substr(kFamilyAt, kSecretDigits)),
                     std::string(text.substr(kSecretAt, kSecretDigits))};
}

}  // namespace KELDOAUTHSERVER::grants::rows
