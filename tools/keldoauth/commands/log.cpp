// keldoauth log: the audit log.

#include <ostream>

#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/console/clock.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/terminal.h"
#include "tools/keldoauth/storage/rows.h"
#include "tools/keldoauth/storage/stores.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

constexpr Columns kListColumns{
    {"TIME", "time"},
    {"MESSAGE", names::kMsg},
};

long long rowCount(Log& log) {
  Json::Value count;
  if (log.DBGetRowCount(count) == 0) throw libraryFailure(log);
  return numberIn(count[0U]);
}

/// Oldest first; the newest are picked from the end.
Answer list(const Arguments& arguments) {
  std::string newestFirst = "ORDER BY id DESC";
  if (arguments.last) newestFirst += " LIMIT " + std::to_string(*arguments.last);
  Log log;
  Json::Value rows(Json::arrayValue);
  if (log.Get(arguments.contains.value_or(""), newestFirst, &rows) == 0) {
    throw libraryFailure(log);
  }
  Answer answer;
  Json::Value& entries = answer.document["entries"] = Json::arrayValue;
  for (Json::ArrayIndex i = rows.size(); i > 0; --i) entries.append(presentLogEntry(rows[i - 1]));
  return answer;
}

void printEntries(const Json::Value& document, std::ostream& out) {
  printList(out, document, "entries", kListColumns);
}

/// Storing an entry also trims the log, which may take the new one with it.
Answer add(const Arguments& arguments) {
  Log log;
  if (log.Add(*arguments.message) == 0) throw libraryFailure(log);
  Answer answer;
  answer.document["stored"] = true;
  answer.document["rows"] = Json::Int64(rowCount(log));
  return answer;
}

void printAdded(const Json::Value& document, std::ostream& out) {
  out << "Stored; the log holds "
      << counted(static_cast<std::size_t>(document["rows"].asUInt64()), "row") << ".\n";
}

Answer clear(const Arguments& arguments) {
  Log log;
  const long long rows = rowCount(log);
  Answer answer;
  answer.document["cleared"] = Json::Int64(rows);
  if (rows == 0) return answer;

  confirm(arguments,
          "Delete all " + counted(static_cast<std::size_t>(rows), "row") + " of the audit log?");
  if (log.Del() == 0 && log.GetErrCode() != errors::kNone.code) throw libraryFailure(log);
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
      {"list", "List entries, oldest first", {kContains, kLast, kJson}, list, printEntries},
      {"add", "Write an entry", {required(kMessage), kJson}, add, printAdded, Needs::kNothing},
      {"clear", "Delete all entries", {kYes, kJson}, clear, printCleared},
  };
  return commands;
}

}  // namespace tool
