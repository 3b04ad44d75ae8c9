// Pushed requests among the codes.

#ifndef KELDOAUTH_GRANTS_ROWS_PUSHED_ROWS_H
#define KELDOAUTH_GRANTS_ROWS_PUSHED_ROWS_H

#include <string>

#include "grants/rows/read_rows.h"

namespace KELDOAUTHSERVER::grants::rows {

struct PushedRow {
  CodeRow row;
  PushedState state;
};

/// The application's own that is alive: kInvalidRequestUri otherwise. Throws
/// Trouble.
Outcome<PushedRow> findPushed(Store& store, const std::string& application,
                              const RequestReference& reference, long long now);

}  // namespace KELDOAUTHSERVER::grants::rows

#endif  // KELDOAUTH_GRANTS_ROWS_PUSHED_ROWS_H
