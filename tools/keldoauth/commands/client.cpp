// keldoauth client: the registry of applications.

#include <ostream>

#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/commands/grants.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/terminal.h"
#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/storage/bounds.h"
#include "tools/keldoauth/storage/encrypted_values.h"
#include "tools/keldoauth/storage/stores.h"
#include "utils/oauth_bounds.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

constexpr Columns kListColumns{
    {"ID", names::kId},
    {"ENABLED", "enabled"},
    {"NAME", names::kDisplayName, Width::kShrinks},
    {"CLIENT ID", names::kClientId, Width::kShrinks, identifierText},
    {"REDIRECT URI", names::kRedirectUri, Width::kShrinks},
    {"SCOPE", names::kScope, Width::kShrinks},
};

constexpr Columns kDetailColumns{
    {"id", names::kId},
    {"enabled", "enabled"},
    {"name", names::kDisplayName},
    {"client id", names::kClientId, Width::kFixed, identifierText},
    {"client secret", names::kClientSecret, Width::kFixed, secretText},
    {"redirect uri", names::kRedirectUri},
    {"scope", names::kScope},
};

constexpr Columns kCredentialColumns{
    {"client id", names::kClientId, Width::kFixed, identifierText},
    {"client secret", names::kClientSecret, Width::kFixed, secretText},
};

std::string described(const Json::Value& client) {
  return "client " + client[names::kId].asString() + " (" +
         printable(client[names::kDisplayName].asString()) + ")";
}

std::string withoutScheme(const std::string& address) {
  for (const std::string scheme : {"https://", "http://"}) {
    if (address.compare(0, scheme.size(), scheme) == 0) return address.substr(scheme.size());
  }
  return address;
}

// Registration --------------------------------------------------------------------

/// The row that was just stored. What the store handed back serves when it
/// cannot be read again: the generated secret must reach the user.
Json::Value storedRow(Clients& clients, const Json::Value& credentials) {
  Json::Value rows(Json::arrayValue);
  const bool isFound =
      clients.Get(credentials[names::kClientId].asString(), &rows) != 0 && !rows.empty();
  return isFound ? rows[0U] : credentials;
}

Answer add(const Arguments& arguments) {
  const std::string identifier = arguments.clientId.value_or(getRandomStr(kIdentifierLength));
  const std::string secret = arguments.secretFile
                                 ? readSecret(*arguments.secretFile, "Client secret")
                                 : getRandomStr(kIdentifierLength);
  Clients clients;
  requireKeyOf(clients);
  Json::Value credentials;
  if (clients.Add(identifier, secret, *arguments.redirectUri, *arguments.scope,
                  *arguments.displayName, arguments.disabled ? "0" : "1", credentials) == 0) {
    const std::string address = withoutScheme(*arguments.redirectUri);
    throw refused(clients,
                  outOfBounds({{"--client-id", identifier, bounds::kIdentifier},
                               {"--secret-file", secret, bounds::kIdentifier},
                               {"--redirect-uri without its scheme", address, bounds::kRedirectUri},
                               {"--scope", *arguments.scope, bounds::kScope},
                               {"--name", *arguments.displayName, bounds::kDisplayName}}));
  }
  const bool isShown = arguments.reveal || !arguments.secretFile;
  return answerRow<Clients>(storedRow(clients, credentials), shownIf(isShown));
}

void printAdded(const Json::Value& document, std::ostream& out) {
  const Json::Value& client = document["client"];
  out << "Registered " << described(client) << ".\n";
  printDetails(out, client, kCredentialColumns);
}

// Looking up ----------------------------------------------------------------------

Answer list(const Arguments& arguments) {
  Clients clients;
  Answer answer;
  Json::Value& shown = answer.document["clients"] = Json::arrayValue;
  for (const Json::Value& row : allRows(clients)) {
    shown.append(presentClient(row, shownIf(arguments.reveal)));
  }
  return answer;
}

void printClients(const Json::Value& document, std::ostream& out) {
  printList(out, document, Clients::kPlural, kListColumns);
}

Answer show(const Arguments& arguments) {
  return answerRow<Clients>(requireClient(*arguments.client), shownIf(arguments.reveal));
}

void printClient(const Json::Value& document, std::ostream& out) {
  printDetails(out, document["client"], kDetailColumns);
}

// Changing ------------------------------------------------------------------------

/// The new value, or the old one as it was before the library doubled its
/// quotes: the edit doubles them again.
std::string newOrOld(const Arguments::Text& given, const Json::Value& stored) {
  return given ? *given : withoutDoubledQuotes(stored.asString());
}

Answer edit(const Arguments& arguments) {
  if (!arguments.redirectUri && !arguments.scope && !arguments.displayName) {
    throw Failure(kUsage, "nothing to change", "--redirect-uri, --scope or --name");
  }
  Clients clients;
  Transaction transaction(clients);
  const Json::Value row = requireClient(clients, *arguments.client);
  const long long id = idOf(row);
  const std::string address = newOrOld(arguments.redirectUri, row[names::kRedirectUri]);
  const std::string scope = newOrOld(arguments.scope, row[names::kScope]);
  const std::string name = newOrOld(arguments.displayName, row[names::kDisplayName]);
  if (clients.Edit(id, address, scope, name) == 0) {
    throw refused(clients, outOfBounds({{"--redirect-uri", address, bounds::kRedirectUri},
                                        {"--scope", scope, bounds::kScope},
                                        {"--name", name, bounds::kDisplayName}}));
  }
  transaction.commit();
  return answerRow<Clients>(rowById(clients, id), Secrets::kMasked);
}

Answer switchTo(const Arguments& arguments, bool isEnabled) {
  Clients clients;
  Transaction transaction(clients);
  const long long id = idOf(requireClient(clients, *arguments.client));
  if ((isEnabled ? clients.Enable(id) : clients.Disable(id)) == 0) throw libraryFailure(clients);
  transaction.commit();
  return answerRow<Clients>(rowById(clients, id), Secrets::kMasked);
}

Answer enable(const Arguments& arguments) {
  return switchTo(arguments, true);
}

Answer disable(const Arguments& arguments) {
  return switchTo(arguments, false);
}

void printSwitched(const Json::Value& document, std::ostream& out) {
  const Json::Value& client = document["client"];
  out << (client["enabled"].asBool() ? "Enabled " : "Disabled ") << described(client) << ".\n";
}

Answer remove(const Arguments& arguments) {
  Clients clients;
  const Json::Value row = requireClient(clients, *arguments.client);
  confirm(arguments, "Remove " + described(row) + "? Its codes and tokens stay.");
  removeUnchanged(clients, row);
  return answerRow<Clients>(row, Secrets::kMasked);
}

void printRemoved(const Json::Value& document, std::ostream& out) {
  out << "Removed " << described(document["client"]) << ".\n";
}

}  // namespace

const std::vector<Command>& clientCommands() {
  using namespace option;
  static const std::vector<Command> commands{
      {"add",
       "Register an application",
       {required(kRedirectUri), required(kScope), required(kDisplayName), kClientId, kSecretFile,
        kDisabled, kReveal, kJson},
       add,
       printAdded,
       Needs::kNothing,
       NewKey::kAllowed},
      {"list", "List all applications", {kReveal, kJson}, list, printClients},
      {"show",
       "Show one application",
       {required(kClientArgument), kReveal, kJson},
       show,
       printClient},
      {"edit",
       "Change redirect address, scope or name",
       {required(kClientArgument), kRedirectUri, kScope, kDisplayName, kJson},
       edit,
       printClient},
      {"enable",
       "Switch an application on",
       {required(kClientArgument), kJson},
       enable,
       printSwitched},
      {"disable",
       "Switch an application off",
       {required(kClientArgument), kJson},
       disable,
       printSwitched},
      {"remove",
       "Remove an application; its codes and tokens stay",
       {required(kClientArgument), kYes, kJson},
       remove,
       printRemoved},
  };
  return commands;
}

}  // namespace tool
