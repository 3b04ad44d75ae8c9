#include "utils/decimal.h"

#include <cstdlib>

#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {

long long decimalValue(const Json::Value& value) {
  if (value.isNull() || value.isArray() || value.isObject()) return 0;
  if (value.isString()) return std::strtoll(value.asCString(), nullptr, 10);
  return std::strtoll(value.asString().c_str(), nullptr, 10);
}

}  // namespace KELDOAUTHSERVER
