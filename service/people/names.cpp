#include "service/people/names.h"

#include <algorithm>

#include "service/text/encoding.h"
#include "utils/oauth_bounds.h"

namespace keldoauth::service {
namespace {

constexpr KELDOAUTHSERVER::Bounds kName = KELDOAUTHSERVER::bounds::kUsername;

/// U+0080 to U+009F, which UTF-8 writes with this byte in front.
bool hasLateControl(std::string_view text) {
  for (std::size_t i = 0; i + 1 < text.size(); ++i) {
    if (text[i] == '\xC2' && static_cast<unsigned char>(text[i + 1]) < 0xA0) return true;
  }
  return false;
}

}  // namespace

bool isUserName(std::string_view name) {
  return name.size() >= static_cast<std::size_t>(kName.min) &&
         name.size() <= static_cast<std::size_t>(kName.max) &&
         std::none_of(name.begin(), name.end(), isControl) && !hasLateControl(name) && isUtf8(name);
}

bool isPassword(std::string_view password) {
  constexpr std::string_view kNever("\0\n\r", 3);
  return !password.empty() && password.size() <= kMaxPasswordBytes &&
         password.find_first_of(kNever) == std::string_view::npos;
}

}  // namespace keldoauth::service
