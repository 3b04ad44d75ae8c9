// Numbers in result documents, where every value is a text.

#ifndef KELDOAUTH_UTILS_DECIMAL_H
#define KELDOAUTH_UTILS_DECIMAL_H

#include <json/value.h>

namespace KELDOAUTHSERVER {

/// The number at the start of a decimal text, after blanks and with an optional
/// sign. Out of range saturates. A text without digits, null, an array and an
/// object read as 0.
long long decimalValue(const Json::Value& value);

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_UTILS_DECIMAL_H
