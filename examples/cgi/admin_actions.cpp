#include "examples/cgi/admin_actions.h"

#include "core/oauth_errors.h"
#include "examples/cgi/admin_pages.h"
#include "examples/cgi/admin_rows.h"
#include "examples/cgi/code_state.h"
#include "examples/cgi/encoding.h"
#include "examples/cgi/html.h"
#include "examples/cgi/redirect.h"
#include "examples/cgi/scopes.h"
#include "stores/oauth_clientInfo.h"
#include "utils/oauth_names.h"

namespace service {
namespace {

using namespace KELDOAUTHSERVER;

/// Back to a page that can be reloaded without doing it again.
Answer done(const Request& request, const std::string& word) {
  return redirectAnswer(request, "/admin?done=" + word);
}

std::string chosenScope(const Parameters& form) {
  std::string chosen;
  for (const Scope& scope : kScopes) {
    if (!form.has(std::string("scope.") + scope.name)) continue;
    if (!chosen.empty()) chosen += ' ';
    chosen += scope.name;
  }
  return chosen;
}

std::string faultOf(const Draft& draft) {
  std::string fault = faultOfName(draft.name);
  if (!fault.empty()) return fault;
  if (draft.redirect.size() > kMaxRedirect) return "The redirect address is too long.";
  if (!isRedirectAddress(draft.redirect)) {
    return "The redirect address must start with https://, or with http:// for 127.0.0.1 and "
           "localhost, and have no fragment.";
  }
  return draft.scope.empty() ? "Choose at least one thing that it may ask to do." : "";
}

Answer registerClient(const Request& request, const Parameters& form) {
  Draft draft{form.value("name"), form.value("redirect"), chosenScope(form), ""};
  draft.fault = faultOf(draft);
  if (!draft.fault.empty()) return applicationsPage(request.user, "", draft);

  OAUTHDBClientInfo store(names::kClientInfoTable);
  Json::Value issued;
  if (store.Add(draft.redirect, draft.scope, draft.name, issued) == 0) {
    if (store.GetErrCode() != errors::kClientInfoFull.code) throw Unavailable{};
    draft.fault = "There is no room for another application. Remove one first.";
    return applicationsPage(request.user, "", draft);
  }
  return secretPage(request.user, draft.name, issued[names::kClientId].asString(),
                    issued[names::kClientSecret].asString());
}

Answer changeClient(const Request& request, const Parameters& form, const std::string& action) {
  const std::optional<Client> client = findClient(form.value("client"));
  if (!client) return done(request, "gone");
  if (action == "remove") {
    if (!removeClient(*client)) return done(request, "gone");
    note("Application removed[" + client->name + "] by " + request.user);
    return done(request, "removed");
  }
  const bool enable = action == "enable";
  const std::string word = enable ? "enabled" : "disabled";
  if (!setEnabled(client->id, enable)) return done(request, "gone");
  note("Application " + word + "[" + client->name + "] by " + request.user);
  return done(request, word);
}

Answer revoke(const Request& request, const Parameters& form) {
  const std::string user = form.value("user");
  const std::string clientId = form.value("client");
  const bool removed = removeAccess(user, clientId);
  if (removed) {
    const std::optional<Client> client = findClient(clientId);
    note("Access revoked[" + (client ? client->name : clientId) + "] for " + user + " by " +
         request.user);
  }
  return done(request, std::string(removed ? "revoked" : "gone") +
                           "&view=access&user=" + percentEncode(user));
}

}  // namespace

Answer act(const Request& request, const Parameters& form) {
  const std::string action = form.value("action");
  if (action == "register") return registerClient(request, form);
  if (action == "revoke") return revoke(request, form);
  if (action == "enable" || action == "disable" || action == "remove") {
    return changeClient(request, form, action);
  }
  return messagePage(400, "This form is not known", "Nothing was changed.");
}

}  // namespace service
