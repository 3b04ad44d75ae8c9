// keldoauth client: the registry of applications. What changes it stands in
// client_change.cpp.

#include "tools/keldoauth/commands/client.h"

#include <ostream>

#include "tools/keldoauth/console/output.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;
using grants::Application;
using grants::Grants;

namespace tool {
namespace {

std::string addressText(const Json::Value& row) {
  return row[names::kRedirectUri].asString();
}

std::string pkceText(const Json::Value& row) {
  return row["pkce_required"].asBool() ? "required" : "optional";
}

std::string logoutText(const Json::Value& row) {
  return listText(row["logout_uris"]);
}

std::string originText(const Json::Value& row) {
  return row["registered_itself"].asBool() ? "itself" : "an administrator";
}

constexpr Columns kListColumns{
    {"ID", names::kId},
    {"ENABLED", "enabled"},
    {"NAME", names::kDisplayName, Width::kShrinks},
    {"CLIENT ID", names::kClientId, Width::kShrinks, identifierText},
    {"REDIRECT URI", names::kRedirectUri, Width::kShrinks, addressText},
    {"SCOPE", names::kScope, Width::kShrinks},
};

constexpr Columns kDetailColumns{
    {"id", names::kId},
    {"enabled", "enabled"},
    {"name", names::kDisplayName},
    {"client id", names::kClientId, Width::kFixed, identifierText},
    {"client secret", names::kClientSecret, Width::kFixed, secretText},
    {"redirect uri", names::kRedirectUri, Width::kFixed, addressText},
    {"logout uri", "logout_uris", Width::kFixed, logoutText},
    {"scope", names::kScope},
    {"pkce", "pkce_required", Width::kFixed, pkceText},
    {"registered by", "registered_itself", Width::kFixed, originText},
};

Answer list(const Arguments& arguments) {
  const Grants grants;
  Answer answer;
  Json::Value& shown = answer.document["clients"] = Json::arrayValue;
  for (const Application& application : grants.applications.all()) {
    shown.append(presentWithSecret(grants, application, shownIf(arguments.reveal)));
  }
  return answer;
}

void printClients(const Json::Value& document, std::ostream& out) {
  printList(out, document, "clients", kListColumns);
}

Answer show(const Arguments& arguments) {
  const Grants grants;
  Answer answer;
  answer.document["client"] =
      presentWithSecret(grants, chosenClient(grants, *arguments.client), shownIf(arguments.reveal));
  return answer;
}

void printClient(const Json::Value& document, std::ostream& out) {
  printDetails(out, document["client"], kDetailColumns);
}

}  // namespace

const std::vector<Command>& clientCommands() {
  using namespace option;
  static const std::vector<Command> commands{
      {"add",
       "Register an application",
       {kRedirectUri, kNoRedirectUri, kLogoutUri, required(kScope), required(kDisplayName),
        kClientId, kPublic, kSecretFile, kPkce, kDisabled, kReveal, kJson},
       addClient,
       printCredentials,
       Needs::kNothing,
       NewKey::kAllowed},
      {"list", "List all applications", {kReveal, kJson}, list, printClients},
      {"show",
       "Show one application",
       {required(kClientArgument), kReveal, kJson},
       show,
       printClient},
      {"edit",
       "Change addresses, scope, name or whether PKCE is required",
       {required(kClientArgument), kRedirectUri, kNoRedirectUri, kLogoutUri, kScope, kDisplayName,
        kPkce, kJson},
       editClient,
       printClient},
      {"renew-secret",
       "Give an application another secret; the old one is no good any more",
       {required(kClientArgument), kYes, kJson},
       renewSecret,
       printCredentials},
      {"enable",
       "Switch an application on",
       {required(kClientArgument), kJson},
       enableClient,
       printSwitched},
      {"disable",
       "Switch an application off: nothing of it is good meanwhile",
       {required(kClientArgument), kJson},
       disableClient,
       printSwitched},
      {"revoke",
       "End all that an application has; it stays registered",
       {required(kClientArgument), kYes, kJson},
       revokeClient,
       printClientRevoked},
      {"remove",
       "Delete an application with its codes and tokens",
       {required(kClientArgument), kYes, kJson},
       removeClient,
       printClientRemoved},
  };
  return commands;
}

}  // namespace tool
