// Numbers in result documents, where every value is a text: a header alone, since
// the library exports no function for it and the floors above need it, too.

#ifndef KELDOAUTH_UTILS_DECIMAL_H
#define KELDOAUTH_UTILS_DECIMAL_H

#include <json/value.h>

#include <cstdlib>

#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {

/// The number at the start of a decimal text, after blanks and with an optional
/// sign. Out of range saturates. A text without digits, null, an array and an
/// object read as 0.
inline long long decimalValue(const Json::Value& value) {
  if (value.isNull() || value.isArray() || value.isObject()) return 0;
  if (value.isString()) return std::strtoll(value.asCString(), nullptr, 10);
  return std::strtoll(value.asString().c_str(), nullptr, 10);
}

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_UTILS_DECIMAL_H
