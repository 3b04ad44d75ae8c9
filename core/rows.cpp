#include "core/rows.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <string_view>

#include "utils/oauth_names.h"
#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {
namespace {

constexpr std::array<std::string_view, 17> kKnownColumns{
    names::kAccessToken,  names::kClientId, names::kClientSecret, names::kCode,
    names::kDisplayName,  names::kEnable,   names::kExpiredTime,  names::kFlowType,
    names::kId,           names::kIp,       names::kMsg,          names::kRedirectUri,
    names::kRefreshToken, names::kScope,    names::kState,        names::kTimestamp,
    names::kUsername,
};

constexpr bool isSorted() {
  for (std::size_t i = 1; i < kKnownColumns.size(); ++i) {
    if (kKnownColumns[i] <= kKnownColumns[i - 1]) return false;
  }
  return true;
}
static_assert(isSorted());

/// The same name where it is there to stay; null for a column of no store.
const char* lastingName(std::string_view column) {
  const auto* const found = std::lower_bound(kKnownColumns.begin(), kKnownColumns.end(), column);
  return found != kKnownColumns.end() && *found == column ? found->data() : nullptr;
}

}  // namespace

/// A document copies the names of its members unless it is told that they last:
/// in the listing of a full table, megabytes of them.
Json::Value rowDocument(int count, char** values, char** columns) {
  Json::Value row(Json::objectValue);
  const int readable = readableColumns(count, values, columns);
  for (int i = 0; i < readable; ++i) {
    const char* const column = textOf(columns[i]);
    const char* const lasting = lastingName(column);
    Json::Value& member = lasting != nullptr ? row[Json::StaticString(lasting)] : row[column];
    member = textOf(values[i]);
  }
  return row;
}

}  // namespace KELDOAUTHSERVER
