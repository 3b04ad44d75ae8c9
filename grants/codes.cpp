#include "grants/codes.h"

#include <string>
#include <utility>

#include "grants/rows/checks.h"
#include "grants/rows/digest.h"
#include "grants/rows/issuing.h"
#include "grants/rows/notes.h"
#include "grants/rows/pushed_rows.h"
#include "grants/rows/quotes.h"
#include "grants/rows/read_rows.h"
#include "grants/rows/room_rules.h"
#include "grants/rows/store.h"
#include "utils/clock.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace KELDOAUTHSERVER::grants {
namespace {

using rows::ApplicationRow;
using rows::CodeRow;
using rows::CodeState;
using rows::doubled;

constexpr Bounds kChallenge{1, 128};
constexpr Bounds kRedirect{0, bounds::kRedirectUri.max};
constexpr Bounds kReference{0, kIdentifierLength};
constexpr char kS256[] = "S";
constexpr char kPlain[] = "P";

Refusal requestFault(Why why) {
  return {Error::kInvalidRequest, why};
}

Refusal grantFault(Why why) {
  return {Error::kInvalidGrant, why};
}

// Issuing -----------------------------------------------------------------------

CodeState stateOf(const CodeRequest& request, long long now) {
  CodeState state{request.redirect.text(), request.named == AddressNamed::kInRequest, "", "", now,
                  request.text.text()};
  if (request.pkce) {
    state.method = request.pkce->method == Pkce::Method::kS256 ? kS256 : kPlain;
    state.challenge = request.pkce->challenge.text();
  }
  state.evictsNothing = request.withoutPage;
  return state;
}

/// What only the application's row can tell.
std::optional<Refusal> faultOf(const CodeRequest& request, const Application& application) {
  if (!rows::isScopeWithin(request.scope.text(), application.scope.text())) {
    return Refusal{Error::kInvalidScope, Why::kWiderScope};
  }
  if (application.needsPkce && !request.pkce && !request.waivesPkce) {
    return requestFault(Why::kNeedsPkce);
  }
  return {};
}

/// One code for one pushed request.
std::optional<Refusal> takePushed(Store& store, const CodeRequest& request, long long now) {
  if (!request.pushed) return {};
  const auto pushed = rows::findPushed(store, request.application.text(), *request.pushed, now);
  if (!pushed) return pushed.refusal();
  rows::erase(store, pushed->row);
  return {};
}

/// What the user's logins say to a code for which they are not asked.
std::optional<Refusal> faultWithoutPage(Store& store, const CodeRequest& request, long long now) {
  if (!request.withoutPage || rows::hasLogin(store, request.user.text(), request.application.text(),
                                             request.scope.text(), now)) {
    return {};
  }
  return Refusal{Error::kAccessDenied, Why::kNotRemembered};
}

rows::Evicts evictsOf(bool nothing) {
  return nothing ? rows::Evicts::kNothing : rows::Evicts::kOldest;
}

Json::Value rowOf(const CodeRequest& request, const IssuedCode& issued, long long now) {
  Json::Value row;
  row[names::kUsername] = doubled(request.user.text());
  row[names::kClientId] = doubled(request.application.text());
  row[names::kScope] = doubled(request.scope.text());
  row[names::kCode] = rows::markOf(issued.code.text());
  row[names::kExpiredTime] = std::to_string(issued.expires);
  row[names::kState] = doubled(pack(stateOf(request, now)));
  row[names::kIp] = request.from.text();
  row[names::kId] = Json::Value();
  return row;
}

// Redeeming ---------------------------------------------------------------------

std::optional<Why> faultOfTexts(const Redemption& redemption) {
  const std::string none;
  const std::string& redirect = redemption.redirect ? redemption.redirect->text() : none;
  const std::string& verifier = redemption.verifier ? redemption.verifier->text() : none;
  if (rows::hasNul(redemption.code.text() + redirect + verifier)) return Why::kHasNul;
  return {};
}

/// One that is not named in the request need not be repeated, but may be.
bool isRightAddress(const CodeState& state, const std::optional<RedirectAddress>& shown) {
  if (!shown || shown->text().empty()) return !state.isNamed || state.redirect.empty();
  return shown->text() == state.redirect;
}

/// A verifier where there was no challenge is somebody else's code.
bool isRightVerifier(const CodeState& state, const std::optional<Verifier>& shown) {
  if (state.method.empty()) return !shown;
  if (!shown) return false;
  return rows::equalSecrets(
      state.method == kPlain ? shown->text() : rows::challengeOf(shown->text()), state.challenge);
}

/// What is wrong with a code, spent or not, for the one who shows it.
std::optional<Why> faultOf(const CodeRow& code, const Redemption& redemption) {
  if (code.application != redemption.application.text()) return Why::kOtherApplication;
  if (!code.isOurs()) return Why::kForeign;
  if (!isRightAddress(*code.state, redemption.redirect)) return Why::kWrongAddress;
  if (!isRightVerifier(*code.state, redemption.verifier)) return Why::kWrongVerifier;
  return {};
}

/// The login that came from a spent code; none when it has ended.
std::optional<rows::TokenRow> loginOf(Store& store, const rows::Spent& spent) {
  auto login = rows::findToken(store, names::kId, std::to_string(spent.tokenRow));
  if (!login || !login->isOurs() || login->state->family != spent.family) return {};
  return login;
}

Refusal endReplayed(Store& store, Whole& whole, const ApplicationRow& application,
                    const CodeRow& code, long long now) {
  if (isWithinGrace(code.state->spent->time, now, store.policy)) {
    return grantFault(Why::kUsedBefore);
  }
  if (const auto login = loginOf(store, *code.state->spent)) {
    rows::erase(store, *login);
    rows::noteEnd(store,
                  {application.shown.name, code.application, application.shown.registeredItself},
                  login->user, rows::kAfterReplay);
    whole.commit();
  }
  return grantFault(Why::kReplayed);
}

/// Remembered for as long as its login can last.
void spend(Store& store, const CodeRow& code, const rows::Stored& login, long long now) {
  CodeState state = *code.state;
  state.spent = rows::Spent{now, login.row, login.family};
  Json::Value modified;
  modified[names::kState] = doubled(pack(state));
  modified[names::kExpiredTime] = std::to_string(later(state.issued, store.policy.family));
  Store::changeSeen(store.codes, conditionOf(code), modified);
}

}  // namespace

std::optional<Refusal> Codes::faultOf(const CodeRequest& request) {
  const std::string challenge = request.pkce ? request.pkce->challenge.text() : "-";
  const std::string reference = request.pushed ? request.pushed->text() : "";
  const auto why = rows::faultOf({{request.user.text(), bounds::kUsername},
                                  {request.application.text(), bounds::kIdentifier},
                                  {request.scope.text(), bounds::kScope},
                                  {request.redirect.text(), kRedirect},
                                  {challenge, kChallenge},
                                  {reference, kReference},
                                  {request.text.text(), kCallerTextBounds}});
  if (why) return requestFault(*why);
  if (request.user.text() == kNoUser) return requestFault(Why::kReservedUser);
  if (!rows::isPeer(request.from.text())) return requestFault(Why::kBadPeer);
  if (!rows::isLifetime(request.lifetime)) return requestFault(Why::kOutOfBounds);
  if (!fitsEver(stateOf(request, 0), request.scope.text())) return requestFault(Why::kTooMuch);
  return {};
}

Outcome<IssuedCode> Codes::issue(const CodeRequest& request) {
  if (const auto fault = faultOf(request)) return *fault;
  Whole whole(store_);
  const long long now = currentTime();
  const IssuedCode issued{
      Code(rows::randomDigits(kIdentifierLength)),
      now + request.lifetime.value_or(getExpiredPeriod(names::kGrantCodeExpired))};

  const auto application = rows::actingApplication(store_, request.application);
  if (!application) return application.refusal();
  if (const auto fault = grants::faultOf(request, application->shown)) return *fault;
  if (const auto fault = faultWithoutPage(store_, request, now)) return *fault;
  if (const auto fault = takePushed(store_, request, now)) return *fault;
  if (!rows::makeRoomForCode(store_, request.user.text(), request.application.text(),
                             evictsOf(request.withoutPage), now)) {
    return Refusal{Error::kAccessDenied, Why::kWouldEvict};
  }
  Store::insert(store_.codes, rowOf(request, issued, now));
  whole.commit();
  return issued;
}

Outcome<Pair> Codes::redeem(const Redemption& redemption) {
  if (const auto why = faultOfTexts(redemption)) return grantFault(*why);
  if (!rows::isPeer(redemption.from.text())) return requestFault(Why::kBadPeer);
  if (!rows::isLifetime(redemption.lifetime)) return requestFault(Why::kOutOfBounds);

  Whole whole(store_);
  const long long now = currentTime();
  const auto application = rows::actingApplication(store_, redemption.application);
  if (!application) return application.refusal();
  const auto code = rows::findShownCode(store_, redemption.code.text());
  if (!code) return grantFault(Why::kUnknown);
  if (const auto why = grants::faultOf(*code, redemption)) return grantFault(*why);
  if (code->isSpent()) return endReplayed(store_, whole, *application, *code, now);
  if (code->expires <= now) return grantFault(Why::kExpired);

  const auto login =
      rows::storeToken(store_,
                       {User(code->user), redemption.application, Scope(code->scope),
                        CallerText(code->state->text), redemption.from, redemption.lifetime,
                        code->state->issued, false, evictsOf(code->state->evictsNothing)},
                       now);
  if (!login) return grantFault(Why::kWouldEvict);
  spend(store_, *code, *login, now);
  whole.commit();
  return login->pair;
}

}  // namespace KELDOAUTHSERVER::grants
