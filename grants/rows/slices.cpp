#include "grants/rows/slices.h"

#include <algorithm>
#include <utility>

#include "grants/rows/quotes.h"
#include "utils/decimal.h"
#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER::grants::rows {
namespace {

constexpr char kSealedSecret[] = "sealed_secret";
constexpr char kLength[] = "list_length";
constexpr int kNoLimit = -1;

/// The row as a table's own would come.
Json::Value opened(Json::Value row) {
  for (const auto& [sealed, column] : {std::pair(kSealedIdentifier, names::kClientId),
                                       std::pair(kSealedSecret, names::kClientSecret)}) {
    if (row.isMember(sealed)) row[column] = row[sealed];
  }
  OAUTHDBBasic::ParamDecrypt(row);
  return row;
}

/// The list's length stands alone when the part is empty.
Part read(Store& store, const List& list, int most, int skipped) {
  const Json::Value found =
      store.rowsOf("SELECT " + std::string(kLength) + ",part.*" + list.details + " FROM (SELECT " +
                   list.length + " AS " + kLength + ") AS whole LEFT JOIN (" + list.rows +
                   " ORDER BY " + list.order + " LIMIT " + std::to_string(most) + " OFFSET " +
                   std::to_string(skipped) + ") AS part ON 1 ORDER BY " + list.order);
  Part part{Json::Value(Json::arrayValue), decimalValue(found[0U][kLength])};
  for (const Json::Value& row : found) {
    if (!row[names::kId].asString().empty()) part.rows.append(opened(row));
  }
  return part;
}

}  // namespace

std::string sealedIdentifier() {
  return std::string(names::kClientId) + " AS " + kSealedIdentifier;
}

std::string sealedSecret() {
  return std::string(names::kClientSecret) + " AS " + kSealedSecret;
}

Part partOf(Store& store, const List& list, const Slice& slice) {
  return read(store, list, std::max(slice.most, 0), std::max(slice.skipped, 0));
}

Part wholeOf(Store& store, const List& list) {
  return read(store, list, kNoLimit, 0);
}

std::string contains(const std::string& column, const std::string& part) {
  return "(instr(lower(" + column + "),lower(" + literal(doubled(part)) + "))>0)";
}

}  // namespace KELDOAUTHSERVER::grants::rows
