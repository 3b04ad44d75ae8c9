#include "examples/cgi/admin_actions.h"

#include <string_view>
#include <vector>

#include "examples/cgi/admin_pages.h"
#include "examples/cgi/clients.h"
#include "examples/cgi/encoding.h"
#include "examples/cgi/html.h"
#include "examples/cgi/redirect.h"
#include "examples/cgi/scopes.h"

namespace service {
namespace {

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

grants::Actor by(const Request& request) {
  return grants::Actor(request.user);
}

Answer faulty(const grants::Grants& store, const Request& request, Draft draft,
              const std::string& fault) {
  draft.fault = fault;
  return applicationsPage(store, request.user, "", draft);
}

Answer registerClient(grants::Grants& store, const Request& request, const Parameters& form) {
  const Draft draft{form.value("name"), form.value("redirect"), chosenScope(form), ""};
  const std::string fault = faultOf(draft);
  if (!fault.empty()) return faulty(store, request, draft, fault);
  const grants::ApplicationName name(draft.name);
  try {
    const auto registered = store.applications.add(
        {name, {grants::RedirectAddress(draft.redirect)}, grants::Scope(draft.scope)}, by(request));
    if (registered) return secretPage(request.user, name, *registered);
    return faulty(store, request, draft,
                  std::string(grants::explain(registered.refusal().why)) + ".");
  } catch (const grants::Trouble& trouble) {
    if (trouble.kind() != grants::Trouble::Kind::kFull) throw;
    return faulty(store, request, draft,
                  "There is no room for another application. Remove one first.");
  }
}

/// The word for what became of it; the only refusal is that it is not there.
template <typename Value>
Answer changed(const Request& request, const grants::Outcome<Value>& outcome, const char* word) {
  return done(request, outcome ? word : "gone");
}

Answer enable(grants::Grants& store, const Request& request, const Parameters& form) {
  const grants::ApplicationId client(form.value("client"));
  return changed(request, store.applications.enable(client, by(request)), "enabled");
}

Answer disable(grants::Grants& store, const Request& request, const Parameters& form) {
  const grants::ApplicationId client(form.value("client"));
  return changed(request, store.applications.disable(client, by(request)), "disabled");
}

Answer remove(grants::Grants& store, const Request& request, const Parameters& form) {
  const grants::ApplicationId client(form.value("client"));
  return changed(request, store.applications.remove(client, by(request)), "removed");
}

Answer ended(const Request& request, const grants::Ended& ended, const std::string& shown) {
  const bool wasThere = ended.codes + ended.tokens > 0;
  return done(request, std::string(wasThere ? "revoked" : "gone") + "&view=access&" + shown);
}

/// What the application has for itself. It may fetch more: disabling stops that.
grants::Ended endOwn(grants::Grants& store, const grants::ApplicationId& client,
                     const grants::Actor& by) {
  std::vector<grants::AccessHandle> own;
  for (const grants::AccessEntry& entry : store.access.list({{}, client})) {
    if (entry.kind == grants::AccessEntry::Kind::kOwn) own.push_back(entry.handle);
  }
  return store.access.end(own, by);
}

Answer revoke(grants::Grants& store, const Request& request, const Parameters& form) {
  const grants::ApplicationId client(form.value("client"));
  const grants::User user(form.value("user"));
  if (user.text().empty()) {
    return ended(request, endOwn(store, client, by(request)),
                 "application=" + percentEncode(client.text()));
  }
  return ended(request, store.access.endUserWith(user, client, by(request)),
               "user=" + percentEncode(user.text()));
}

Answer revokeAll(grants::Grants& store, const Request& request, const Parameters& form) {
  const grants::User user(form.value("user"));
  return ended(request, store.access.endUser(user, by(request)),
               "user=" + percentEncode(user.text()));
}

constexpr struct {
  std::string_view name;
  Answer (*act)(grants::Grants& store, const Request& request, const Parameters& form);
} kActions[] = {{"register", registerClient}, {"enable", enable}, {"disable", disable},
                {"remove", remove},           {"revoke", revoke}, {"revoke-all", revokeAll}};

}  // namespace

Answer act(grants::Grants& store, const Request& request, const Parameters& form) {
  const std::string asked = form.value("action");
  for (const auto& action : kActions) {
    if (action.name == asked) return action.act(store, request, form);
  }
  return messagePage(400, "This form is not known", "Nothing was changed.");
}

}  // namespace service
