// keldoauth user: what a user has agreed to, and ending it.

#include <algorithm>
#include <map>
#include <ostream>
#include <set>

#include "tools/keldoauth/commands/access.h"
#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/commands/present.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/terminal.h"
#include "tools/keldoauth/console/text.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;
using grants::AccessEntry;
using grants::Grants;

namespace tool {
namespace {

std::string renewedText(const Json::Value& row) {
  return row["renewed_at"].isNull() ? "-" : row["renewed_at"].asString();
}

constexpr Columns kListColumns{
    {"USERNAME", names::kUsername, Width::kShrinks},
    {"CLIENTS", "clients"},
    {"LOGINS", "tokens"},
    {"CODES", "codes"},
    {"LAST RENEWED", "renewed_at", Width::kFixed, renewedText},
};

constexpr Columns kShowColumns{
    {"KIND", "kind"},
    {"ID", names::kId},
    {"CLIENT", "client_name", Width::kShrinks, clientText},
    {"SCOPE", names::kScope, Width::kShrinks},
    {"SINCE", "since", Width::kFixed, sinceText},
    {"ENDS IN", "ends", Width::kFixed, endText},
    {"FROM", names::kIp, Width::kShrinks},
};

struct Holdings {
  std::set<std::string> clients;
  int codes = 0;
  int tokens = 0;
  long long renewed = 0;
};

Json::Value present(const std::string& name, const Holdings& held) {
  Json::Value shown;
  shown[names::kUsername] = name;
  shown["clients"] = Json::UInt64(held.clients.size());
  shown["codes"] = held.codes;
  shown["tokens"] = held.tokens;
  shown["renewed"] = secondsOrNull(held.renewed);
  shown["renewed_at"] = held.renewed == 0 ? Json::Value() : timeOrNull(held.renewed);
  return shown;
}

Answer list(const Arguments& /*arguments*/) {
  std::map<std::string, Holdings> users;
  for (const AccessEntry& entry : Grants().access.list({})) {
    if (!entry.user) continue;
    Holdings& held = users[entry.user->text()];
    held.clients.insert(entry.application.text());
    ++(isCode(entry) ? held.codes : held.tokens);
    held.renewed = std::max(held.renewed, entry.renewed);
  }
  Answer answer;
  Json::Value& shown = answer.document["users"] = Json::arrayValue;
  for (const auto& [name, held] : users) shown.append(present(name, held));
  return answer;
}

void printUsers(const Json::Value& document, std::ostream& out) {
  printList(out, document, "users", kListColumns);
}

Answer show(const Arguments& arguments) {
  Answer answer;
  Json::Value& user = answer.document["user"];
  user[names::kUsername] = *arguments.username;
  user["codes"] = Json::arrayValue;
  user["tokens"] = Json::arrayValue;
  const Grants grants;
  for (const AccessEntry& entry : grants.access.list(filterOf(grants, arguments))) {
    user[isCode(entry) ? "codes" : "tokens"].append(tool::present(entry));
  }
  return answer;
}

void printUser(const Json::Value& document, std::ostream& out) {
  const Json::Value& user = document["user"];
  Json::Value rows(Json::arrayValue);
  for (const char* kind : {"tokens", "codes"}) {
    for (const Json::Value& row : user[kind]) rows.append(row);
  }
  if (rows.empty()) {
    out << printable(user[names::kUsername].asString()) << " has nothing.\n";
  } else {
    printTable(out, rows, kShowColumns);
  }
}

Answer revoke(const Arguments& arguments) {
  Grants grants;
  const grants::AccessFilter filter = filterOf(grants, arguments);
  Answer answer;
  answer.document[names::kUsername] = *arguments.username;
  const std::size_t live = grants.access.list(filter).size();
  if (live > 0) {
    confirm(arguments, "End all that " + printable(*arguments.username) + " has" +
                           (arguments.client ? " with client " + *arguments.client : "") + " (" +
                           counted(live, "row") + ")?");
  }
  const grants::Ended ended =
      filter.application ? grants.access.endUserWith(*filter.user, *filter.application, actor())
                         : grants.access.endUser(*filter.user, actor());
  answer.document["codes"] = ended.codes;
  answer.document["tokens"] = ended.tokens;
  return answer;
}

void printRevoked(const Json::Value& document, std::ostream& out) {
  const std::string name = printable(document[names::kUsername].asString());
  const auto codes = static_cast<std::size_t>(document["codes"].asUInt64());
  const auto tokens = static_cast<std::size_t>(document["tokens"].asUInt64());
  if (codes + tokens == 0) {
    out << name << " has nothing that could be ended.\n";
  } else {
    out << "Revoked " << counted(codes, "code") << " and " << counted(tokens, "login") << " of "
        << name << ".\n";
  }
}

}  // namespace

const std::vector<Command>& userCommands() {
  using namespace option;
  static const std::vector<Command> commands{
      {"list", "List users who have something", {kJson}, list, printUsers},
      {"show",
       "Show what a user has",
       {required(kUserArgument), kOfClient, kJson},
       show,
       printUser},
      {"revoke",
       "End all that a user has, codes included",
       {required(kUserArgument), kOfClient, kYes, kJson},
       revoke,
       printRevoked},
  };
  return commands;
}

}  // namespace tool
