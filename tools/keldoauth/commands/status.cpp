// keldoauth status: the state of the service's storage on one page.

#include <ostream>
#include <string>
#include <vector>

#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/console/clock.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/health/health.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

Json::Value inspectLifetimes() {
  Json::Value lifetimes;
  for (const char* key : {names::kGrantCodeExpired, names::kTokenExpired}) {
    lifetimes[key] = getExpiredPeriod(key);
  }
  return lifetimes;
}

Answer status(const Arguments& /*arguments*/) {
  Problems problems;
  Answer answer;
  Json::Value& document = answer.document;
  document["version"] = KELDOAUTH_VERSION;
  document["files"] = inspectFiles(problems);
  document["disk"] = inspectDisk(problems);
  inspectKeyFiles(problems);
  inspectSettings(problems);
  document["database"] = inspectDatabase(document["files"], problems);
  document["server"] = inspectServer(problems);
  document["lifetimes"] = inspectLifetimes();
  document["diagnostics"] = inspectDiagnostics(problems);
  document["problems"] = problems.list();
  if (!problems.list().empty()) answer.exit = kUnhealthy;
  return answer;
}

// For people --------------------------------------------------------------------------

std::string ownerText(const Json::Value& file) {
  if (!file["error"].isNull()) return file["error"].asString();
  if (!file["exists"].asBool()) return "absent";
  return file["owner"].asString() + ":" + file["group"].asString();
}

std::string limitText(const Json::Value& table) {
  return table["limit"].asString() + " (" + table["limit_key"].asString() + ")";
}

/// What the numbers of the tables mean.
void printMeanings(const Json::Value& tables, std::ostream& out) {
  out << "\nAn expired row is dead: no good to anybody, gone with the next purge, and no\n"
         "obstacle to new ones. A login counts as expired once it cannot be refreshed.\n";
  const auto redeemed = static_cast<std::size_t>(tables[1]["redeemed"].asUInt64());
  if (redeemed > 0) {
    out << counted(redeemed, "redeemed code") << (redeemed == 1 ? " is" : " are")
        << " kept to notice when one comes again.\n";
  }
}

constexpr Columns kFileColumns{
    {"FILE", "path"},
    {"OWNER", "owner", Width::kFixed, ownerText},
    {"MODE", "mode"},
    {"BYTES", "size"},
};

constexpr Columns kTableColumns{
    {"TABLE", "name"},
    {"ROWS", "rows"},
    {"EXPIRED", "expired"},
    {"LIMIT", "limit", Width::kFixed, limitText},
};

Json::Value inOrder(const Json::Value& files) {
  Json::Value list(Json::arrayValue);
  for (const char* name : {"folder", "database", "settings", "debug_flag"}) {
    list.append(files[name]);
  }
  return list;
}

void printDiagnostics(const Json::Value& diagnostics, std::ostream& out) {
  out << "Diagnostics  " << (diagnostics["debug_flag"].asBool() ? "on" : "off") << ", log level "
      << diagnostics["log_level"].asString();
  std::string separator = ": ";
  for (const Json::Value& name : diagnostics["log_classes"]) {
    out << separator << name.asString();
    separator = ", ";
  }
  out << '\n';
}

void printProblems(const Json::Value& problems, std::ostream& out) {
  if (problems.empty()) {
    out << "\nNothing is wrong.\n";
    return;
  }
  out << "\nWrong:\n";
  for (const Json::Value& problem : problems) {
    out << "  " << problem["subject"].asString() << ": " << printable(problem["message"].asString())
        << '\n';
    const std::string hint = problem["hint"].asString();
    if (!hint.empty()) out << "      " << printable(hint) << '\n';
  }
}

void printServer(const Json::Value& server, std::ostream& out) {
  if (server.isNull()) return;
  out << "\nServer       " << cellText(server["address"]) << " port " << cellText(server["port"])
      << ", PostgreSQL " << cellText(server["settings"]["server_version"]) << "\n";
  for (const Json::Value& standby : server["standbys"]) {
    out << "Standby      " << cellText(standby["name"]) << ", " << cellText(standby["sync"]) << ", "
        << cellText(standby["state"]) << ", " << cellText(standby["lag_bytes"])
        << " bytes behind\n";
  }
}

void printStatus(const Json::Value& document, std::ostream& out) {
  const Json::Value& database = document["database"];
  printTable(out, inOrder(document["files"]), kFileColumns);
  out << '\n';
  if (database["ready"].asBool()) {
    printTable(out, database["tables"], kTableColumns);
    printMeanings(database["tables"], out);
  } else {
    out << "Database     " << cellText(database["message"]) << '\n';
  }
  printServer(document["server"], out);
  const Json::Value& lifetimes = document["lifetimes"];
  out << "\nLifetimes    codes " << duration(lifetimes[names::kGrantCodeExpired].asInt64())
      << ", access tokens " << duration(lifetimes[names::kTokenExpired].asInt64()) << '\n';
  printDiagnostics(document["diagnostics"], out);
  printProblems(document["problems"], out);
}

}  // namespace

const Command& statusCommand() {
  static const Command command{"status",        "Show files, tables, limits and what is wrong",
                               {option::kJson}, status,
                               printStatus,     Needs::kNothing};
  return command;
}

}  // namespace tool
