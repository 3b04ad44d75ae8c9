#include "grants/applications.h"

#include <algorithm>
#include <string>
#include <utility>

#include "grants/rows/checks.h"
#include "grants/rows/digest.h"
#include "grants/rows/notes.h"
#include "grants/rows/quotes.h"
#include "grants/rows/read_rows.h"
#include "grants/rows/registry_words.h"
#include "grants/rows/room_rules.h"
#include "grants/rows/slices.h"
#include "grants/rows/store.h"
#include "utils/clock.h"
#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER::grants {
namespace {

using rows::ApplicationRow;
using rows::doubled;
using rows::RegistryWords;

constexpr Refusal kGone{Error::kInvalidClient, Why::kNoApplication};

// Checks ------------------------------------------------------------------------

std::optional<Refusal> metadataFault(std::optional<Why> why) {
  if (!why) return {};
  return Refusal{Error::kInvalidClientMetadata, *why};
}

std::optional<Refusal> faultOfName(const ApplicationName& name) {
  if (rows::isIdentifier(name.text())) return metadataFault(Why::kNameIsIdentifier);
  return metadataFault(rows::faultOf({{name.text(), bounds::kDisplayName}}));
}

std::optional<Refusal> faultOfScope(const Scope& scope) {
  return metadataFault(rows::faultOf({{scope.text(), bounds::kScope}}));
}

std::optional<Refusal> faultOfIdentifier(const ApplicationId& identifier) {
  if (rows::isIdentifier(identifier.text())) return {};
  return metadataFault(rows::hasNul(identifier.text()) ? Why::kHasNul : Why::kOutOfBounds);
}

/// One that is marked as none would make the application public.
std::optional<Refusal> faultOfSecret(const Secret& secret, ApplicationKind kind) {
  if (kind == ApplicationKind::kPublic) return metadataFault(Why::kPublic);
  if (const auto why = rows::faultOf({{secret.text(), bounds::kIdentifier}})) {
    return metadataFault(why);
  }
  const bool isGood =
      rows::isVisible(secret.text()) && secret.text().rfind(rows::kPublicStart, 0) != 0;
  return metadataFault(isGood ? std::optional<Why>() : Why::kOutOfBounds);
}

std::optional<Refusal> faultOfWords(const RegistryWords& words) {
  for (const auto* list : {&words.addresses, &words.logoutAddresses}) {
    for (const std::string& address : *list) {
      if (rows::hasNul(address)) return Refusal{Error::kInvalidRedirectUri, Why::kHasNul};
      if (!rows::isAddress(address)) return Refusal{Error::kInvalidRedirectUri, Why::kBadAddress};
    }
  }
  if (rows::isWithin(pack(words), bounds::kRedirectUri)) return {};
  return Refusal{Error::kInvalidRedirectUri, Why::kTooMuch};
}

template <typename Kind>
std::vector<std::string> textsOf(const std::vector<Kind>& list) {
  std::vector<std::string> texts;
  texts.reserve(list.size());
  for (const Kind& item : list) texts.push_back(item.text());
  return texts;
}

RegistryWords wordsOf(const NewApplication& application) {
  const bool isPublic = application.kind == ApplicationKind::kPublic;
  return {textsOf(application.addresses),
          textsOf(application.logoutAddresses),
          !application.needsPkce && !isPublic,
          application.registersItself,
          {},
          application.wantsEs256};
}

std::optional<Refusal> faultOf(const NewApplication& application) {
  std::optional<Refusal> fault = faultOfName(application.name);
  if (!fault) fault = faultOfScope(application.scope);
  if (!fault && application.identifier) fault = faultOfIdentifier(*application.identifier);
  if (!fault && application.secret) fault = faultOfSecret(*application.secret, application.kind);
  if (!fault) fault = faultOfWords(wordsOf(application));
  return fault;
}

// Rows --------------------------------------------------------------------------

Json::Value conditionOf(const Application& application) {
  Json::Value condition;
  condition[names::kClientId] = doubled(application.identifier.text());
  return condition;
}

std::string newSecret() {
  return rows::randomDigits(kIdentifierLength);
}

/// What stands where a public application has no secret: nobody was told it.
std::string secretOfNobody() {
  const std::string start = rows::kPublicStart;
  return start + rows::randomDigits(kIdentifierLength - start.size());
}

std::string wordOf(const Application& application) {
  return rows::applicationWord(application.name, application.identifier.text());
}

/// One entry for all that register themselves: their names are anybody's.
void noteRegistration(Store& store, const NewApplication& application,
                      const ApplicationId& identifier, const Actor& by) {
  const std::string word = rows::applicationWord(application.name, identifier.text());
  if (application.registersItself) {
    rows::note(store, "Application registered itself", word);
  } else {
    rows::note(store, "Application registered" + word + rows::actorWord(by));
  }
}

/// And one for all that they change of themselves, or when they go: nobody shall
/// wash the log out by it.
void noteChange(Store& store, const char* what, const Application& application, const Actor& by) {
  const std::string subject = std::string("Application ") + what;
  if (application.registeredItself && by == kItself) {
    rows::note(store, subject + " itself", wordOf(application));
  } else {
    rows::note(store, subject + wordOf(application) + rows::actorWord(by));
  }
}

Json::Value rowOf(const NewApplication& application, const std::string& identifier,
                  const std::string& secret) {
  Json::Value row;
  row[names::kEnable] = application.isEnabled ? "1" : "0";
  row[names::kClientId] = doubled(identifier);
  row[names::kClientSecret] = doubled(secret);
  row[names::kRedirectUri] = doubled(pack(wordsOf(application)));
  row[names::kScope] = doubled(application.scope.text());
  row[names::kDisplayName] = doubled(application.name.text());
  row[names::kId] = Json::Value();
  return row;
}

Removed removeGrants(Store& store, const ApplicationId& identifier) {
  const std::string isIts = rows::isOneOf(names::kClientId, {Store::sealed(identifier.text())});
  const long long codes = store.countErased(names::kGrantCodeTable, isIts);
  const long long tokens = store.countErased(names::kTokenTable, isIts);
  return {static_cast<int>(codes), static_cast<int>(tokens)};
}

std::vector<Application> shown(const Json::Value& found) {
  std::vector<Application> applications;
  for (const Json::Value& row : found) applications.push_back(rows::applicationOf(row).shown);
  return applications;
}

}  // namespace

// Registration ------------------------------------------------------------------

Outcome<Registered> Applications::add(const NewApplication& application, const Actor& by) {
  if (const auto fault = faultOf(application)) return *fault;
  const bool isPublic = application.kind == ApplicationKind::kPublic;
  const ApplicationId identifier =
      application.identifier.value_or(ApplicationId(rows::randomDigits(kIdentifierLength)));
  const Secret secret = application.secret.value_or(Secret(newSecret()));

  Whole whole(store_);
  if (rows::findApplication(store_, identifier.text())) {
    return Refusal{Error::kInvalidClientMetadata, Why::kTaken};
  }
  rows::makeRoomForApplication(store_, application.registersItself, currentTime());
  Store::insert(store_.applications,
                rowOf(application, identifier.text(), isPublic ? secretOfNobody() : secret.text()));
  // What one of this identifier had, that another program removed, is not its.
  if (application.identifier) removeGrants(store_, identifier);
  noteRegistration(store_, application, identifier, by);
  whole.commit();
  if (isPublic) return Registered{identifier, {}};
  return Registered{identifier, secret};
}

// Look-ups ----------------------------------------------------------------------

std::optional<Application> Applications::find(const ApplicationId& identifier) const {
  const auto found = rows::findApplication(store_, identifier.text());
  return found ? std::optional<Application>(found->shown) : std::nullopt;
}

std::vector<Application> Applications::named(const ApplicationName& name) const {
  if (rows::hasNul(name.text())) return {};
  return shown(Store::rowsWhere(store_.applications,
                                rows::isOneOf(names::kDisplayName, rows::spellings(name.text()))));
}

std::vector<Application> Applications::all() const {
  return shown(Store::rowsWhere(store_.applications, ""));
}

Sliced<Application> Applications::page(const std::string& contains, const Slice& slice) const {
  if (rows::hasNul(contains)) return {{}, 0};
  std::string condition = rows::contains(names::kDisplayName, contains);
  if (rows::isWithin(contains, bounds::kIdentifier)) {
    condition += " OR " + rows::isOneOf(names::kClientId, {Store::sealed(contains)});
  }
  const std::string found = " FROM " + std::string(names::kClientInfoTable) + " WHERE " + condition;
  const rows::Part part =
      rows::partOf(store_,
                   {"SELECT id,enable," + rows::sealedIdentifier() + "," + rows::sealedSecret() +
                        ",redirect_uri,scope,display_name,lower(display_name) AS sorted" + found,
                    "sorted,id", "(SELECT COUNT(*)" + found + ")", ""},
                   slice);
  return {shown(part.rows), part.length};
}

Outcome<Application> Applications::authenticate(const ApplicationId& identifier,
                                                const std::optional<Secret>& secret) const {
  const auto found = rows::findApplication(store_, identifier.text());
  if (!found) return kGone;
  const bool isPublic = found->shown.kind == ApplicationKind::kPublic;
  const bool isIt =
      secret ? !isPublic && rows::equalSecrets(secret->text(), found->secret) : isPublic;
  if (!isIt) return Refusal{Error::kInvalidClient, Why::kWrongSecret};
  if (!found->shown.isEnabled) return Refusal{Error::kInvalidClient, Why::kDisabled};
  return found->shown;
}

std::optional<Secret> Applications::secretOf(const ApplicationId& identifier) const {
  const auto found = rows::findApplication(store_, identifier.text());
  if (!found || found->shown.kind == ApplicationKind::kPublic) return {};
  return Secret(found->secret);
}

// Changes -----------------------------------------------------------------------

namespace {

RegistryWords changedWords(const ApplicationRow& row, const ApplicationChange& change) {
  RegistryWords words = row.words;
  if (change.addresses) words.addresses = textsOf(*change.addresses);
  if (change.logoutAddresses) words.logoutAddresses = textsOf(*change.logoutAddresses);
  if (change.needsPkce && row.shown.kind != ApplicationKind::kPublic) {
    words.isPkceOptional = !*change.needsPkce;
  }
  words.wantsEs256 = change.wantsEs256.value_or(words.wantsEs256);
  return words;
}

bool changesWords(const ApplicationChange& change) {
  return change.addresses || change.logoutAddresses || change.needsPkce || change.wantsEs256;
}

/// Addresses that another program stored without a scheme may stay.
std::optional<Refusal> faultOf(const ApplicationChange& change, RegistryWords words) {
  std::optional<Refusal> fault;
  if (change.name) fault = faultOfName(*change.name);
  if (!fault && change.scope) fault = faultOfScope(*change.scope);
  if (fault || !changesWords(change)) return fault;
  if (!rows::isWithin(pack(words), bounds::kRedirectUri)) {
    return Refusal{Error::kInvalidRedirectUri, Why::kTooMuch};
  }
  if (!change.addresses) words.addresses.clear();
  return faultOfWords(words);
}

Json::Value modifiedBy(const ApplicationChange& change, const RegistryWords& words) {
  Json::Value modified(Json::objectValue);
  if (change.name) modified[names::kDisplayName] = doubled(change.name->text());
  if (change.scope) modified[names::kScope] = doubled(change.scope->text());
  if (changesWords(change)) modified[names::kRedirectUri] = doubled(pack(words));
  return modified;
}

Outcome<Done> switchTo(Store& store, const ApplicationId& identifier, bool isEnabled,
                       const Actor& by) {
  Whole whole(store);
  const auto found = rows::findApplication(store, identifier.text());
  if (!found) return kGone;
  if (found->shown.isEnabled == isEnabled) return Done{};
  Json::Value modified;
  modified[names::kEnable] = isEnabled ? "1" : "0";
  Store::changeSeen(store.applications, conditionOf(found->shown), modified);
  rows::note(store, std::string("Application ") + (isEnabled ? "enabled" : "disabled") +
                        wordOf(found->shown) + rows::actorWord(by));
  whole.commit();
  return Done{};
}

}  // namespace

Outcome<Application> Applications::change(const ApplicationId& identifier,
                                          const ApplicationChange& change, const Actor& by) {
  Whole whole(store_);
  const auto found = rows::findApplication(store_, identifier.text());
  if (!found) return kGone;
  const RegistryWords words = changedWords(*found, change);
  if (const auto fault = faultOf(change, words)) return *fault;
  const Json::Value modified = modifiedBy(change, words);
  if (modified.empty()) return found->shown;

  Store::changeSeen(store_.applications, conditionOf(found->shown), modified);
  const auto changed = rows::findApplication(store_, identifier.text());
  noteChange(store_, "changed", changed->shown, by);
  whole.commit();
  return changed->shown;
}

Outcome<Secret> Applications::renewSecret(const ApplicationId& identifier, const Actor& by) {
  Whole whole(store_);
  const auto found = rows::findApplication(store_, identifier.text());
  if (!found) return kGone;
  if (found->shown.kind == ApplicationKind::kPublic) {
    return Refusal{Error::kUnauthorizedClient, Why::kPublic};
  }
  const Secret secret(newSecret());
  Json::Value modified;
  modified[names::kClientSecret] = secret.text();
  Store::changeSeen(store_.applications, conditionOf(found->shown), modified);
  rows::note(store_, "Secret renewed" + wordOf(found->shown) + rows::actorWord(by));
  whole.commit();
  return secret;
}

Outcome<Done> Applications::enable(const ApplicationId& identifier, const Actor& by) {
  return switchTo(store_, identifier, true, by);
}

Outcome<Done> Applications::disable(const ApplicationId& identifier, const Actor& by) {
  return switchTo(store_, identifier, false, by);
}

Outcome<Removed> Applications::remove(const ApplicationId& identifier, const Actor& by) {
  Whole whole(store_);
  const auto found = rows::findApplication(store_, identifier.text());
  if (!found) return kGone;
  Store::erase(store_.applications, conditionOf(found->shown));
  const Removed removed = removeGrants(store_, identifier);
  noteChange(store_, "removed", found->shown, by);
  whole.commit();
  return removed;
}

}  // namespace KELDOAUTHSERVER::grants
