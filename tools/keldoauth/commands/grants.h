// What codes and tokens have in common: both are granted by a user to a client
// and expire, so both are listed, filtered and purged alike. `Store` is Codes
// or Tokens.

#ifndef KELDOAUTH_TOOLS_GRANTS_H
#define KELDOAUTH_TOOLS_GRANTS_H

#include <json/value.h>

#include <string>

#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/console/clock.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/terminal.h"
#include "tools/keldoauth/storage/purge.h"
#include "tools/keldoauth/storage/stores.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace tool {

template <typename Store>
Answer answerRow(const Json::Value& row, Secrets secrets) {
  Answer answer;
  answer.document[Store::kNoun] = Store::kPresent(row, secrets);
  return answer;
}

// Listing -----------------------------------------------------------------------

/// A name with quotes is in the database as given or with them doubled.
inline bool isNamed(const Json::Value& stored, const std::string& name) {
  return stored == name || stored == KELDOAUTHSERVER::getSQLFormatStr(name);
}

template <typename Store>
Answer listGrants(const Arguments& arguments) {
  namespace names = KELDOAUTHSERVER::names;
  const std::string client = arguments.client ? clientIdentifier(*arguments.client) : "";
  const long long now = currentTime();
  Store store;
  Answer answer;
  Json::Value& shown = answer.document[Store::kPlural] = Json::arrayValue;
  for (const Json::Value& row : allRows(store)) {
    if (arguments.client && row[names::kClientId] != client) continue;
    if (arguments.username && !isNamed(row[names::kUsername], *arguments.username)) continue;
    if (arguments.expired && !Store::isExpired(expiryOf(row), now)) continue;
    shown.append(Store::kPresent(row, shownIf(arguments.reveal)));
  }
  return answer;
}

// Purging -----------------------------------------------------------------------

template <typename Store>
Answer purgeGrants(const Arguments& arguments) {
  Store store;
  const long long grace = arguments.grace.value_or(0);
  Json::Value rows = purgeable(store, grace);
  if (!arguments.dryRun && !rows.empty()) {
    confirm(arguments,
            "Purge " + counted(rows.size(), std::string("expired ") + Store::kNoun) + "?");
    rows = purge(store, grace);
  }
  Answer answer;
  answer.document["dry_run"] = arguments.dryRun;
  answer.document["grace"] = Json::Int64(grace);
  Json::Value& purged = answer.document["purged"] = Json::arrayValue;
  for (const Json::Value& row : rows) {
    purged.append(Store::kPresent(row, shownIf(arguments.reveal)));
  }
  return answer;
}

/// A table of what was purged, or would be, and a line that counts it.
void printPurged(const Json::Value& document, const std::string& noun, const Columns& columns,
                 std::ostream& out);

// Issuing and changing ----------------------------------------------------------

/// The identifier of the client that --client names, with a note on standard
/// error when it is switched off: the library would not mind.
std::string clientToIssueFor(const Arguments& arguments);

/// What both kinds of row say about the grant.
struct Grant {
  std::string username;
  std::string client;  // the identifier
  std::string scope;
  std::string state;
};

/// `arguments` with the identifier of its client in place of a row id.
Arguments withClientIdentifier(const Arguments& arguments);

/// `row` with the values that were given in place of its own.
Grant changedGrant(const Json::Value& row, const Arguments& given);

/// The text of the moment `seconds` from now.
std::string expiryIn(long long seconds);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_GRANTS_H
