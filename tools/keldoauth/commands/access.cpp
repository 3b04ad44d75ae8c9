#include "tools/keldoauth/commands/access.h"

#include <algorithm>
#include <cctype>
#include <optional>
#include <ostream>
#include <vector>

#include "core/oauth_errors.h"
#include "tools/keldoauth/commands/present.h"
#include "tools/keldoauth/console/bounds.h"
#include "tools/keldoauth/console/clock.h"
#include "tools/keldoauth/console/terminal.h"
#include "utils/clock.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;
using grants::AccessEntry;
using grants::AccessFilter;
using grants::Ended;
using grants::Grants;

namespace tool {
namespace {

using Entries = std::vector<AccessEntry>;

grants::Rows rowsOf(Table table) {
  return table == Table::kCodes ? grants::Rows::kCodes : grants::Rows::kTokens;
}

std::string pluralOf(Table table) {
  return nounOf(table) + std::string("s");
}

Entries entriesOf(const Grants& grants, Table table, const AccessFilter& filter) {
  Entries entries;
  for (AccessEntry& entry : grants.access.list(filter)) {
    if (entry.handle.table == table) entries.push_back(std::move(entry));
  }
  return entries;
}

Json::Value presentAll(const Entries& entries) {
  Json::Value all(Json::arrayValue);
  for (const AccessEntry& entry : entries) all.append(present(entry));
  return all;
}

// Ending what was named -------------------------------------------------------------

int countOf(Table table, const Ended& ended) {
  return table == Table::kCodes ? ended.codes : ended.tokens;
}

bool isLive(const AccessEntry& entry) {
  return !entry.isDead && entry.kind != AccessEntry::Kind::kSpent;
}

void requireOneWay(const Arguments& arguments) {
  const int ways =
      static_cast<int>(!arguments.ids.empty()) + static_cast<int>(namesFile(arguments)) +
      static_cast<int>(arguments.username || arguments.client) + static_cast<int>(arguments.all);
  if (ways == 1) return;
  throw Failure(kUsage, "name what is meant in one way",
                "one or more IDs, a file, --username and --client, or --all");
}

std::string subjectOf(Table table, const Entries& entries) {
  if (entries.size() == 1) return describedAccess(present(entries.front()));
  return counted(entries.size(), nounOf(table));
}

/// Row ids are given out again: one that was shown may be another's by now.
void requireAllEnded(Table table, const Entries& entries, int ended) {
  const auto live = static_cast<int>(std::count_if(entries.begin(), entries.end(), isLive));
  if (ended >= live) return;
  if (entries.size() == 1) {
    throw Failure(
        kNotFound,
        nounOf(table) + (" " + std::to_string(entries.front().handle.row)) + " has just changed",
        "nothing was done; look at it again");
  }
  throw Failure(kNotFound,
                std::to_string(live - ended) + " of " + std::to_string(entries.size()) + " " +
                    pluralOf(table) + " have just changed, and stay",
                "the others are gone; look at them again");
}

Entries namedEntries(const Grants& grants, Table table, const Arguments& arguments) {
  if (namesFile(arguments)) return {chosenEntry(grants, table, arguments)};
  return chosenEntries(grants, table, arguments.ids);
}

Answer endNamed(Table table, const std::string& verb, const Arguments& arguments) {
  Grants grants;
  const Entries entries = namedEntries(grants, table, arguments);
  confirm(arguments, verb + " " + subjectOf(table, entries) + "?");
  std::vector<grants::AccessHandle> handles;
  for (const AccessEntry& entry : entries) handles.push_back(entry.handle);
  const int ended = countOf(table, grants.access.end(handles, actor()));
  requireAllEnded(table, entries, ended);

  Answer answer;
  answer.document["ended"] = ended;
  if (entries.size() == 1) {
    answer.document[nounOf(table)] = present(entries.front());
  } else {
    answer.document[pluralOf(table)] = presentAll(entries);
  }
  return answer;
}

// Ending what a filter leaves ---------------------------------------------------------

Ended endFiltered(Grants& grants, const AccessFilter& filter, grants::Rows rows) {
  if (filter.user && filter.application) {
    return grants.access.endUserWith(*filter.user, *filter.application, actor(), rows);
  }
  if (filter.user) return grants.access.endUser(*filter.user, actor(), rows);
  if (filter.application) {
    return grants.access.endApplication(*filter.application, actor(), rows);
  }
  return grants.access.endEverything(actor(), rows);
}

std::string whoseOf(const Arguments& arguments) {
  return (arguments.username ? " of " + *arguments.username : "") +
         (arguments.client ? " with client " + *arguments.client : "");
}

Answer endWhatIsLeft(Table table, const Arguments& arguments) {
  Grants grants;
  const AccessFilter filter = filterOf(grants, arguments);
  const std::size_t live = entriesOf(grants, table, filter).size();
  if (live > 0) {
    confirm(arguments, "Revoke " + counted(live, nounOf(table)) + whoseOf(arguments) + "?");
  }
  Answer answer;
  answer.document["ended"] = countOf(table, endFiltered(grants, filter, rowsOf(table)));
  return answer;
}

// Purging ---------------------------------------------------------------------------

Json::Value deadRows(const Grants& grants, Table table, long long grace) {
  AccessFilter everything;
  everything.withDead = true;
  everything.withSpent = true;
  const long long before = currentTime() - grace;
  Json::Value dead(Json::arrayValue);
  for (const AccessEntry& entry : entriesOf(grants, table, everything)) {
    if (entry.isDead && entry.ends <= before) dead.append(present(entry));
  }
  return dead;
}

/// The library's code for the same, where it has one.
std::optional<int> libraryCodeOf(const grants::Refusal& refusal) {
  switch (refusal.error) {
    case grants::Error::kInvalidToken:
      return errors::kAccessTokenExpired.code;
    case grants::Error::kInvalidRequest:
    case grants::Error::kInvalidRedirectUri:
    case grants::Error::kInvalidClientMetadata:
      return errors::kBadParameters.code;
    default:
      return {};
  }
}

/// As a part of a sentence.
std::string reasonOf(const grants::Refusal& refusal) {
  std::string reason = grants::explain(refusal.why);
  reason.front() = static_cast<char>(std::tolower(reason.front()));
  return reason;
}

long long countOf(Table table, const grants::Purged& purged) {
  return table == Table::kCodes ? purged.codes : purged.tokens;
}

}  // namespace

// Looking up ------------------------------------------------------------------------

Answer listAccess(Table table, const Arguments& arguments) {
  const Grants grants;
  AccessFilter filter = filterOf(grants, arguments);
  filter.withDead = true;
  filter.withSpent = arguments.redeemed;
  Answer answer;
  Json::Value& shown = answer.document[pluralOf(table)] = Json::arrayValue;
  for (const AccessEntry& entry : entriesOf(grants, table, filter)) {
    if (!arguments.expired || isExpired(entry)) shown.append(present(entry));
  }
  return answer;
}

Answer showAccess(Table table, const Arguments& arguments) {
  Answer answer;
  answer.document[nounOf(table)] = present(chosenEntry(Grants(), table, arguments));
  return answer;
}

// Ending and purging ----------------------------------------------------------------

Answer revokeAccess(Table table, const Arguments& arguments) {
  requireOneWay(arguments);
  const bool isNamed = !arguments.ids.empty() || namesFile(arguments);
  return isNamed ? endNamed(table, "Revoke", arguments) : endWhatIsLeft(table, arguments);
}

Answer removeAccess(Table table, const Arguments& arguments) {
  requireOneWay(arguments);
  return endNamed(table, "Remove", arguments);
}

void printEnded(Table table, const std::string& verb, const Json::Value& document,
                std::ostream& out) {
  const Json::Value& one = document[nounOf(table)];
  const auto ended = static_cast<std::size_t>(document["ended"].asUInt64());
  const auto named = static_cast<std::size_t>(document[pluralOf(table)].size());
  if (!one.isNull()) {
    out << verb << " " << describedAccess(one) << "; its row is gone.\n";
  } else if (ended == 0 && named == 0) {
    out << "There is nothing to revoke.\n";
  } else {
    out << verb << " " << counted(std::max(ended, named), nounOf(table)) << ".\n";
  }
}

Answer purgeAccess(Table table, const Arguments& arguments) {
  Grants grants;
  const grants::Rows rows = rowsOf(table);
  const long long grace = arguments.grace.value_or(0);
  Answer answer;
  answer.document["dry_run"] = arguments.dryRun;
  answer.document["grace"] = Json::Int64(grace);
  answer.document["purged"] = deadRows(grants, table, grace);
  long long count = countOf(table, grants.room.purgeable(grace, rows));
  if (!arguments.dryRun && count > 0) {
    confirm(arguments,
            "Purge " +
                counted(static_cast<std::size_t>(count), std::string("expired ") + nounOf(table)) +
                "?");
    count = countOf(table, grants.room.purge(grace, rows));
  }
  answer.document["count"] = Json::Int64(count);
  return answer;
}

void printPurged(Table table, const Columns& columns, const Json::Value& document,
                 std::ostream& out) {
  const auto count = static_cast<std::size_t>(document["count"].asUInt64());
  if (count == 0) {
    out << "Nothing to purge.\n";
    return;
  }
  printTable(out, document["purged"], columns);
  out << counted(count, std::string("expired ") + nounOf(table))
      << (document["dry_run"].asBool() ? " would be purged.\n" : " purged.\n");
}

// Issuing ---------------------------------------------------------------------------

Failure refusedRequest(const grants::Refusal& refusal, const std::string& fault) {
  const ExitCode exit = refusal.why == grants::Why::kNoApplication ? kNotFound : kRefused;
  return {exit, reasonOf(refusal), fault, libraryCodeOf(refusal)};
}

Failure notGood(const std::string& what, const grants::Refusal& refusal) {
  return {kInvalid, what + " is not good: " + reasonOf(refusal), "", libraryCodeOf(refusal)};
}

/// The pair is told whatever becomes of the look at its row.
Json::Value presentPair(const Grants& grants, const grants::Pair& pair) {
  Json::Value shown;
  try {
    const auto entry = grants.access.find(grants::AnyToken(pair.access.text()));
    if (entry) shown = present(*entry);
  } catch (const grants::Trouble&) {
    shown[names::kId] = Json::Value();
  }
  shown[names::kAccessToken] = pair.access.text();
  shown[names::kRefreshToken] = pair.refresh ? Json::Value(pair.refresh->text()) : Json::Value();
  return shown;
}

std::string faultInGrant(const Arguments& arguments) {
  if (arguments.expiresIn == 0) return "--expires-in: at least 1 second";
  return outOfBounds({{"--username", arguments.username.value_or("-"), bounds::kUsername},
                      {"--scope", arguments.scope.value_or("-"), bounds::kScope},
                      {"--state", arguments.state.value_or(""), grants::kCallerTextBounds}});
}

}  // namespace tool
