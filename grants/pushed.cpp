#include "grants/pushed.h"

#include <string>

#include "grants/rows/checks.h"
#include "grants/rows/digest.h"
#include "grants/rows/pushed_rows.h"
#include "grants/rows/quotes.h"
#include "grants/rows/room_rules.h"
#include "utils/clock.h"
#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER::grants {
namespace {

using rows::doubled;
using rows::PushedState;

/// What stands where a code has its scope.
constexpr char kNoScope[] = "(request)";

std::optional<Refusal> faultOf(const PushRequest& request) {
  std::optional<Why> why = rows::faultOf({{request.text.text(), kRequestTextBounds}});
  if (!why && !rows::isPeer(request.from.text())) why = Why::kBadPeer;
  return why ? std::optional<Refusal>({Error::kInvalidRequest, *why}) : std::nullopt;
}

Json::Value rowOf(const PushRequest& request, const Pushed& pushed, long long now) {
  Json::Value row;
  row[names::kUsername] = kNoUser;
  row[names::kClientId] = doubled(request.application.text());
  row[names::kScope] = kNoScope;
  row[names::kCode] = rows::markOf(pushed.reference.text());
  row[names::kExpiredTime] = std::to_string(pushed.expires);
  row[names::kState] = doubled(pack(PushedState{now, false, request.text.text()}));
  row[names::kIp] = request.from.text();
  row[names::kId] = Json::Value();
  return row;
}

/// A page is about to show it.
void keepOpen(Store& store, const rows::PushedRow& row, long long now) {
  PushedState state = row.state;
  state.isOpen = true;
  Json::Value modified;
  modified[names::kState] = doubled(pack(state));
  modified[names::kExpiredTime] = std::to_string(later(now, store.policy.pushedOpen));
  Store::changeSeen(store.codes, conditionOf(row.row), modified);
}

}  // namespace

Outcome<Pushed> PushedRequests::push(const PushRequest& request) {
  if (const auto fault = faultOf(request)) return *fault;
  Whole whole(store_);
  const long long now = currentTime();
  const auto application = rows::actingApplication(store_, request.application);
  if (!application) return application.refusal();
  const Pushed pushed{RequestReference(rows::randomDigits(kIdentifierLength)),
                      later(now, store_.policy.pushed)};
  rows::makeRoomForPushed(store_, request.application.text(), now);
  Store::insert(store_.codes, rowOf(request, pushed, now));
  whole.commit();
  return pushed;
}

Outcome<RequestText> PushedRequests::open(const ApplicationId& application,
                                          const RequestReference& reference) {
  Whole whole(store_);
  const long long now = currentTime();
  const auto acting = rows::actingApplication(store_, application);
  if (!acting) return acting.refusal();
  const auto row = rows::findPushed(store_, application.text(), reference, now);
  if (!row) return row.refusal();
  if (!row->state.isOpen) {
    keepOpen(store_, *row, now);
    whole.commit();
  }
  return RequestText(row->state.text);
}

}  // namespace KELDOAUTHSERVER::grants
