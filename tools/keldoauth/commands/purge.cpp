// keldoauth purge: what is dead goes, codes and tokens in one step.

#include <ostream>

#include "grants/grants.h"
#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/terminal.h"

using KELDOAUTHSERVER::grants::Grants;
using KELDOAUTHSERVER::grants::Purged;

namespace tool {
namespace {

std::string amountOf(const Json::Value& document) {
  return counted(static_cast<std::size_t>(document["codes"].asUInt64()), "code") + " and " +
         counted(static_cast<std::size_t>(document["tokens"].asUInt64()), "token");
}

void describe(const Purged& purged, Json::Value& document) {
  document["codes"] = Json::Int64(purged.codes);
  document["tokens"] = Json::Int64(purged.tokens);
}

Answer purge(const Arguments& arguments) {
  Grants grants;
  const long long grace = arguments.grace.value_or(0);
  const Purged dead = grants.room.purgeable(grace);
  Answer answer;
  Json::Value& document = answer.document;
  document["dry_run"] = arguments.dryRun;
  document["grace"] = Json::Int64(grace);
  describe(dead, document);
  if (arguments.dryRun || dead.codes + dead.tokens == 0) return answer;
  confirm(arguments, "Purge " + amountOf(document) + "?");
  describe(grants.room.purge(grace), document);
  return answer;
}

void printPurged(const Json::Value& document, std::ostream& out) {
  if (document["codes"].asUInt64() + document["tokens"].asUInt64() == 0) {
    out << "Nothing to purge.\n";
  } else {
    out << amountOf(document)
        << (document["dry_run"].asBool() ? " would be purged.\n" : " purged.\n");
  }
}

}  // namespace

const Command& purgeCommand() {
  using namespace option;
  static const Command command{
      "purge", "Delete dead codes and tokens", {kGrace, kDryRun, kYes, kJson}, purge, printPurged};
  return command;
}

}  // namespace tool
