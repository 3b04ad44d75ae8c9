#include "tools/keldoauth/storage/bounds.h"

namespace tool {
namespace {

std::string accepted(const Bounds& bounds) {
  const std::string most = std::to_string(bounds.max) + " bytes";
  return bounds.min == bounds.max ? most : std::to_string(bounds.min) + " to " + most;
}

}  // namespace

std::string outOfBounds(std::initializer_list<Measured> values) {
  for (const Measured& measured : values) {
    const auto length = static_cast<long long>(measured.value.size());
    if (length >= measured.bounds.min && length <= measured.bounds.max) continue;
    return std::string(measured.name) + ": " + accepted(measured.bounds) + ", not " +
           std::to_string(length);
  }
  return {};
}

std::string outOfBounds(std::initializer_list<Measured> values, const std::string& ip) {
  std::string found = outOfBounds(values);
  if (found.empty() && !ip.empty()) found = "--ip: neither an IPv4 nor an IPv6 address";
  return found;
}

}  // namespace tool
