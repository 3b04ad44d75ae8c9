#include "service/text/utc.h"

#include <array>
#include <ctime>

#include "utils/wide_time.h"

namespace keldoauth::service {

std::optional<std::string> utcText(long long seconds) {
  const auto when = static_cast<std::time_t>(seconds);
  std::tm parts{};
  std::array<char, 32> text{};
  if (gmtime_r(&when, &parts) == nullptr ||
      std::strftime(text.data(), text.size(), "%Y-%m-%d %H:%M:%S", &parts) == 0) {
    return std::nullopt;
  }
  return text.data();
}

}  // namespace keldoauth::service
