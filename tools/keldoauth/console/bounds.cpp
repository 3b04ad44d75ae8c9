#include "tools/keldoauth/console/bounds.h"

#include <cstddef>

using KELDOAUTHSERVER::Bounds;

namespace tool {
namespace {

bool isWithin(const std::string& value, const Bounds& bounds) {
  return value.size() >= static_cast<std::size_t>(bounds.min) &&
         value.size() <= static_cast<std::size_t>(bounds.max);
}

}  // namespace

std::string accepted(const Bounds& bounds) {
  std::string most = std::to_string(bounds.max) + " bytes";
  if (bounds.min == bounds.max) return most;
  return bounds.min == 0 ? "at most " + most : std::to_string(bounds.min) + " to " + most;
}

std::string outOfBounds(std::initializer_list<Measured> values) {
  for (const Measured& measured : values) {
    if (isWithin(measured.value, measured.bounds)) continue;
    return std::string(measured.name) + ": " + accepted(measured.bounds) + ", not " +
           std::to_string(measured.value.size());
  }
  return {};
}

}  // namespace tool
