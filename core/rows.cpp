#include "core/rows.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <string_view>

#include "core/tables.h"
#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {
namespace {

/// The columns of all tables, each once, sorted.
struct KnownColumns {
  std::array<std::string_view, 32> names{};
  std::size_t count = 0;

  constexpr void add(std::string_view name) {
    std::size_t at = 0;
    while (at < count && names[at] < name) ++at;
    if (at < count && names[at] == name) return;
    for (std::size_t i = count; i > at; --i) names[i] = names[i - 1];
    names[at] = name;
    ++count;
  }
};

constexpr KnownColumns knownColumns() {
  KnownColumns known;
  for (const schema::Table* table : schema::kTables) {
    for (const char* column : table->columns) known.add(column);
  }
  return known;
}

constexpr KnownColumns kKnown = knownColumns();

/// The same name where it is there to stay; null for a column of no table.
const char* lastingName(std::string_view column) {
  const auto* const end = kKnown.names.begin() + kKnown.count;
  const auto* const found = std::lower_bound(kKnown.names.begin(), end, column);
  return found != end && *found == column ? found->data() : nullptr;
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
