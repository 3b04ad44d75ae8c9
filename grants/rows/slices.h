// Parts of long lists, each in one statement together with how long the list is.

#ifndef KELDOAUTH_GRANTS_ROWS_SLICES_H
#define KELDOAUTH_GRANTS_ROWS_SLICES_H

#include <json/value.h>

#include <string>

#include "grants/rows/store.h"
#include "grants/slice.h"

namespace KELDOAUTHSERVER::grants::rows {

/// In SQL.
struct List {
  /// A SELECT whose columns have the tables' names, but for the encrypted ones,
  /// which have those of `sealedColumns`. It has an id.
  std::string rows;
  std::string order;    // of columns of `rows`
  std::string length;   // an expression
  std::string details;  // further columns of what is shown, each behind a comma
};

/// "client_id AS ..." and the secret likewise: no part of an empty list is
/// decrypted.
std::string sealedIdentifier();
std::string sealedSecret();
inline constexpr char kSealedIdentifier[] = "sealed_id";

struct Part {
  Json::Value rows;  // as the tables' own, with the details
  long long length;
};

/// Throws Trouble. A row that cannot be decrypted comes as it is.
Part partOf(Store& store, const List& list, const Slice& slice);
Part wholeOf(Store& store, const List& list);

/// A condition of SQL: the column's text has `part` in it, upper and lower case
/// of ASCII taken for the same.
std::string contains(const std::string& column, const std::string& part);

}  // namespace KELDOAUTHSERVER::grants::rows

#endif  // KELDOAUTH_GRANTS_ROWS_SLICES_H
