// keldoauth log: the audit log.

#include <algorithm>
#include <limits>
#include <ostream>

#include "stores/oauth_log.h"
#include "tools/keldoauth/commands/access.h"
#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/commands/present.h"
#include "tools/keldoauth/console/clock.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/terminal.h"
#include "tools/keldoauth/storage/trouble.h"
#include "utils/clock.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;
using grants::AuditEntry;
using grants::Grants;

namespace tool {
namespace {

constexpr Columns kListColumns{
    {"TIME", "time"},
    {"MESSAGE", names::kMsg, Width::kWraps},
};

Json::Value present(const AuditEntry& entry) {
  Json::Value shown;
  shown[names::kId] = Json::Int64(entry.row);
  shown[names::kTimestamp] = Json::Int64(entry.time);
  shown["time"] = timeOrNull(entry.time);
  shown[names::kMsg] = entry.text;
  return shown;
}

std::optional<long long> momentOf(const char* option, const Arguments::Text& text) {
  if (!text) return {};
  const auto moment = momentIn(*text, currentTime());
  if (moment) return moment;
  throw Failure(kUsage, std::string(option) + ": '" + *text + "' is neither a time nor a duration",
                "such as 90m, 2d, 2026-01-31 or 2026-01-31T08:15 (UTC)");
}

grants::AuditFilter filterOf(const Arguments& arguments) {
  constexpr long long kAll = std::numeric_limits<int>::max();
  grants::AuditFilter filter;
  filter.contains = arguments.contains.value_or("");
  filter.since = momentOf("--since", arguments.since);
  filter.until = momentOf("--until", arguments.until);
  filter.most = static_cast<int>(std::min(arguments.last.value_or(kAll), kAll));
  return filter;
}

/// Oldest first; the newest are picked from the end.
Answer list(const Arguments& arguments) {
  const grants::AuditFilter filter = filterOf(arguments);
  std::vector<AuditEntry> newestFirst = Grants().audit.list(filter);
  std::reverse(newestFirst.begin(), newestFirst.end());
  Answer answer;
  Json::Value& entries = answer.document["entries"] = Json::arrayValue;
  for (const AuditEntry& entry : newestFirst) entries.append(present(entry));
  return answer;
}

void printEntries(const Json::Value& document, std::ostream& out) {
  printList(out, document, "entries", kListColumns);
}

/// An administrator's own words. Storing them also trims the log, which may
/// take the new entry with it.
Answer add(const Arguments& arguments) {
  const Grants grants;
  OAUTHDBLog log(names::kLogTable);
  if (log.Add(*arguments.message) == 0) throw libraryFailure(log);
  Answer answer;
  answer.document["stored"] = true;
  answer.document["rows"] = Json::Int64(grants.room.count().log.rows);
  return answer;
}

void printAdded(const Json::Value& document, std::ostream& out) {
  out << "Stored; the log holds "
      << counted(static_cast<std::size_t>(document["rows"].asUInt64()), "row") << ".\n";
}

Answer clear(const Arguments& arguments) {
  Grants grants;
  const long long rows = grants.room.count().log.rows;
  Answer answer;
  answer.document["cleared"] = 0;
  if (rows == 0) return answer;

  confirm(arguments,
          "Delete all " + counted(static_cast<std::size_t>(rows), "row") + " of the audit log?");
  answer.document["cleared"] = Json::Int64(grants.audit.clear(actor()));
  return answer;
}

void printCleared(const Json::Value& document, std::ostream& out) {
  const auto rows = static_cast<std::size_t>(document["cleared"].asUInt64());
  if (rows == 0) {
    out << "The log is empty.\n";
  } else {
    out << "Deleted " << counted(rows, "row") << ".\n";
  }
}

}  // namespace

const std::vector<Command>& logCommands() {
  using namespace option;
  static const std::vector<Command> commands{
      {"list",
       "List entries, oldest first",
       {kContains, kSince, kUntil, kLast, kJson},
       list,
       printEntries},
      {"add", "Write an entry", {required(kMessage), kJson}, add, printAdded, Needs::kNothing},
      {"clear", "Delete all entries", {kYes, kJson}, clear, printCleared},
  };
  return commands;
}

}  // namespace tool
