// keldoauth client add, edit, renew-secret, enable, disable, revoke and remove.

#include <algorithm>
#include <ostream>

#include "tools/keldoauth/commands/client.h"
#include "tools/keldoauth/console/bounds.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/terminal.h"
#include "tools/keldoauth/storage/encrypted_values.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;
using grants::Application;
using grants::ApplicationKind;
using grants::Grants;

namespace tool {
namespace {

constexpr Columns kCredentialColumns{
    {"client id", names::kClientId, Width::kFixed, identifierText},
    {"client secret", names::kClientSecret, Width::kFixed, secretText},
};

// What was asked for ------------------------------------------------------------------

template <typename Address>
std::vector<Address> addresses(const Arguments::Texts& texts) {
  std::vector<Address> all;
  for (const std::string& text : texts) all.emplace_back(text);
  return all;
}

/// Nothing when no address is to change.
std::optional<std::vector<grants::RedirectAddress>> redirectsOf(const Arguments& arguments) {
  if (arguments.redirectUris.empty() && !arguments.noRedirectUri) return {};
  if (!arguments.redirectUris.empty() && arguments.noRedirectUri) {
    throw Failure(kUsage, "--redirect-uri and --no-redirect-uri exclude each other");
  }
  return addresses<grants::RedirectAddress>(arguments.redirectUris);
}

std::optional<bool> needsPkce(const Arguments& arguments) {
  if (!arguments.pkce) return {};
  if (*arguments.pkce == "required") return true;
  if (*arguments.pkce == "optional") return false;
  throw Failure(kUsage, "--pkce: required or optional");
}

std::string joined(const Arguments::Texts& redirects, const Arguments::Texts& logouts) {
  std::string all;
  for (const auto* list : {&redirects, &logouts}) {
    for (const std::string& text : *list) all += (all.empty() ? "" : " ") + text;
  }
  return all;
}

/// Which value is at fault, for a refusal that says no more than that one is.
Failure refusedClient(const grants::Refusal& refusal, const Arguments& given,
                      const std::string& secret) {
  const std::string addresses = joined(given.redirectUris, given.logoutUris);
  const std::string identifier(kIdentifierLength, '-');
  std::string fault =
      outOfBounds({{"--client-id", given.clientId.value_or(identifier), bounds::kIdentifier},
                   {"--secret-file", secret, bounds::kIdentifier},
                   {"--scope", given.scope.value_or("-"), bounds::kScope},
                   {"--name", given.displayName.value_or("-"), bounds::kDisplayName},
                   {"the addresses together", addresses, {0, bounds::kRedirectUri.max}}});
  if (fault.empty() && refusal.error == grants::Error::kInvalidRedirectUri) {
    fault = "an address has a scheme, such as https://frame.example.org/back, and no blank";
  }
  return refusedRequest(refusal, fault);
}

/// Text of the values of a registration before anything is opened.
grants::NewApplication requestOf(const Arguments& arguments,
                                 const std::optional<std::string>& secret) {
  const auto redirects = redirectsOf(arguments);
  if (!redirects) throw Failure(kUsage, "--redirect-uri is required, or --no-redirect-uri");
  grants::NewApplication request{grants::ApplicationName(*arguments.displayName), *redirects,
                                 grants::Scope(*arguments.scope)};
  request.kind = arguments.isPublic ? ApplicationKind::kPublic : ApplicationKind::kConfidential;
  request.logoutAddresses = addresses<grants::LogoutAddress>(arguments.logoutUris);
  request.needsPkce = needsPkce(arguments).value_or(true);
  request.isEnabled = !arguments.disabled;
  if (arguments.clientId) request.identifier = grants::ApplicationId(*arguments.clientId);
  if (secret) request.secret = grants::Secret(*secret);
  return request;
}

// Registration ------------------------------------------------------------------------

/// What came in under another key would be lost as soon as the right one is
/// back.
void requireKeyOf(const Grants& grants) {
  const std::vector<Application> all = grants.applications.all();
  const bool isKnown = std::any_of(all.begin(), all.end(), [](const Application& application) {
    return isDecrypted(application.identifier.text());
  });
  if (all.empty() || isKnown || !canEncrypt()) return;
  throw Failure(kUnavailable, "the platform's key is not the one that encrypted this store",
                "nothing was stored; put back the key that belongs to the store");
}

/// The registration is told whatever becomes of the look at its row.
Json::Value presentRegistered(const Grants& grants, const grants::Registered& registered,
                              Secrets secrets) {
  Json::Value shown;
  try {
    const auto stored = grants.applications.find(registered.identifier);
    if (stored) shown = present(*stored, registered.secret, secrets);
  } catch (const grants::Trouble&) {
    shown[names::kClientSecret] = registered.secret ? registered.secret->text() : "";
  }
  shown[names::kClientId] = registered.identifier.text();
  return shown;
}

Json::Value presentAgain(const Grants& grants, const Application& application) {
  const auto now = grants.applications.find(application.identifier);
  return presentWithSecret(grants, now.value_or(application), Secrets::kMasked);
}

Answer switchTo(const Arguments& arguments, bool isEnabled) {
  Grants grants;
  const Application application = readableClient(grants, *arguments.client);
  const auto done = isEnabled ? grants.applications.enable(application.identifier, actor())
                              : grants.applications.disable(application.identifier, actor());
  if (!done) throw refusedRequest(done.refusal(), "");
  Answer answer;
  answer.document["client"] = presentAgain(grants, application);
  return answer;
}

/// "1 code and 2 tokens"
std::string amountText(const Json::Value& document) {
  return counted(static_cast<std::size_t>(document["codes"].asUInt64()), "code") + " and " +
         counted(static_cast<std::size_t>(document["tokens"].asUInt64()), "token");
}

}  // namespace

Json::Value presentWithSecret(const Grants& grants, const Application& application,
                              Secrets secrets) {
  const bool isReadable = isDecrypted(application.identifier.text());
  const auto secret = isReadable ? grants.applications.secretOf(application.identifier)
                                 : std::optional<grants::Secret>();
  Json::Value shown = present(application, secret, secrets);
  if (!isReadable && application.kind != ApplicationKind::kPublic) {
    shown["undecrypted"].append(names::kClientSecret);
  }
  return shown;
}

Answer addClient(const Arguments& arguments) {
  std::optional<std::string> secret;
  if (arguments.secretFile) secret = readSecret(*arguments.secretFile, "Client secret");
  const grants::NewApplication request = requestOf(arguments, secret);
  Grants grants;
  requireKeyOf(grants);
  const auto registered = grants.applications.add(request, actor());
  if (!registered) {
    throw refusedClient(registered.refusal(), arguments,
                        secret.value_or(std::string(kIdentifierLength, '-')));
  }
  Answer answer;
  answer.document["client"] =
      presentRegistered(grants, *registered, shownIf(arguments.reveal || !arguments.secretFile));
  return answer;
}

void printCredentials(const Json::Value& document, std::ostream& out) {
  const Json::Value& client = document["client"];
  out << (document["renewed"].asBool() ? "Renewed the secret of " : "Registered ")
      << describedClient(client) << ".\n";
  printDetails(out, client, kCredentialColumns);
}

Answer editClient(const Arguments& arguments) {
  grants::ApplicationChange change;
  change.addresses = redirectsOf(arguments);
  if (!arguments.logoutUris.empty()) {
    change.logoutAddresses = addresses<grants::LogoutAddress>(arguments.logoutUris);
  }
  if (arguments.scope) change.scope = grants::Scope(*arguments.scope);
  if (arguments.displayName) change.name = grants::ApplicationName(*arguments.displayName);
  change.needsPkce = needsPkce(arguments);
  if (!change.addresses && !change.logoutAddresses && !change.scope && !change.name &&
      !change.needsPkce) {
    throw Failure(kUsage, "nothing to change",
                  "--redirect-uri, --logout-uri, --scope, --name or --pkce");
  }
  Grants grants;
  const Application application = readableClient(grants, *arguments.client);
  const auto changed = grants.applications.change(application.identifier, change, actor());
  if (!changed) {
    throw refusedClient(changed.refusal(), arguments, std::string(kIdentifierLength, '-'));
  }
  Answer answer;
  answer.document["client"] = presentWithSecret(grants, *changed, Secrets::kMasked);
  return answer;
}

Answer renewSecret(const Arguments& arguments) {
  Grants grants;
  const Application application = readableClient(grants, *arguments.client);
  confirm(arguments,
          "Renew the secret of " + describedClient(application) + "? The old one is no good then.");
  const auto secret = grants.applications.renewSecret(application.identifier, actor());
  if (!secret) throw refusedRequest(secret.refusal(), "");
  Answer answer;
  answer.document["client"] = present(application, *secret, Secrets::kShown);
  answer.document["renewed"] = true;
  return answer;
}

Answer enableClient(const Arguments& arguments) {
  return switchTo(arguments, true);
}

Answer disableClient(const Arguments& arguments) {
  return switchTo(arguments, false);
}

void printSwitched(const Json::Value& document, std::ostream& out) {
  const Json::Value& client = document["client"];
  out << (client["enabled"].asBool() ? "Enabled " : "Disabled ") << describedClient(client)
      << ".\n";
}

Answer revokeClient(const Arguments& arguments) {
  Grants grants;
  const Application application = readableClient(grants, *arguments.client);
  confirm(arguments, "End all that " + describedClient(application) + " has?");
  const grants::Ended ended = grants.access.endApplication(application.identifier, actor());
  Answer answer;
  answer.document["client"] = presentWithSecret(grants, application, Secrets::kMasked);
  answer.document["codes"] = ended.codes;
  answer.document["tokens"] = ended.tokens;
  return answer;
}

void printClientRevoked(const Json::Value& document, std::ostream& out) {
  out << "Revoked " << amountText(document) << " of " << describedClient(document["client"])
      << ".\n";
}

Answer removeClient(const Arguments& arguments) {
  Grants grants;
  const Application application = readableClient(grants, *arguments.client);
  Answer answer;
  answer.document["client"] = presentWithSecret(grants, application, Secrets::kMasked);
  confirm(arguments, "Remove " + describedClient(application) + " with its codes and tokens?");
  const auto removed = grants.applications.remove(application.identifier, actor());
  if (!removed) {
    throw Failure(kNotFound, describedClient(application) + " has just gone",
                  "nothing was done; look at it again");
  }
  answer.document["codes"] = removed->codes;
  answer.document["tokens"] = removed->tokens;
  return answer;
}

void printClientRemoved(const Json::Value& document, std::ostream& out) {
  out << "Removed " << describedClient(document["client"]) << " with " << amountText(document)
      << ".\n";
}

}  // namespace tool
