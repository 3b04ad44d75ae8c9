#include "grants/rows/pushed_rows.h"

#include <utility>

#include "grants/rows/checks.h"
#include "grants/rows/digest.h"
#include "grants/rows/quotes.h"
#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER::grants::rows {

Outcome<PushedRow> findPushed(Store& store, const std::string& application,
                              const RequestReference& reference, long long now) {
  const auto refuse = [](Why why) { return Refusal{Error::kInvalidRequestUri, why}; };
  if (hasNul(reference.text())) return refuse(Why::kHasNul);
  auto row = findCode(store, names::kCode, markOf(reference.text()));
  auto state = row ? unpackPushed(undoubled(row->storedState)) : std::nullopt;
  if (!state) return refuse(Why::kUnknown);
  if (row->application != application) return refuse(Why::kOtherApplication);
  if (row->expires <= now) return refuse(Why::kExpired);
  return PushedRow{*std::move(row), *std::move(state)};
}

}  // namespace KELDOAUTHSERVER::grants::rows
