#include "service/pages/admin_actions.h"

#include <string_view>
#include <vector>

#include "service/http/encoding.h"
#include "service/pages/admin_pages.h"
#include "service/pages/html.h"
#include "service/protocol/clients.h"
#include "service/protocol/redirect.h"
#include "service/settings/scopes.h"

namespace keldoauth::service {
namespace {

/// Back to a page that can be reloaded without doing it again.
Answer done(const Context& context, const Request& request, const std::string& word) {
  return redirectAnswer(request, context.settings.link("/admin?done=") + word);
}

std::string chosenScope(const ScopeTable& scopes, const Parameters& form) {
  std::string chosen;
  for (const KnownScope& scope : scopes) {
    if (!form.has("scope." + scope.name)) continue;
    if (!chosen.empty()) chosen += ' ';
    chosen += scope.name;
  }
  return chosen;
}

std::string faultOf(const Draft& draft) {
  std::string fault = faultOfName(draft.name);
  if (!fault.empty()) return fault;
  if (draft.redirect.size() > kMaxRedirect) return "The redirect address is too long.";
  if (!isRedirectAddress(draft.redirect, grants::ApplicationKind::kConfidential)) {
    return "The redirect address must start with https://, or with http:// for 127.0.0.1 and "
           "localhost, and have no fragment.";
  }
  return draft.scope.empty() ? "Choose at least one thing that it may ask to do." : "";
}

grants::Actor by(const Request& request) {
  return grants::Actor(request.user);
}

Answer faulty(Context& context, const Request& request, Draft draft, const std::string& fault) {
  draft.fault = fault;
  return applicationsPage(context, request, "", draft);
}

Answer registerClient(Context& context, const Request& request, const Parameters& form) {
  const Draft draft{form.value("name"), form.value("redirect"),
                    chosenScope(context.settings.scopes, form), ""};
  const std::string fault = faultOf(draft);
  if (!fault.empty()) return faulty(context, request, draft, fault);
  const grants::ApplicationName name(draft.name);
  try {
    const auto registered = context.store.open().applications.add(
        {name, {grants::RedirectAddress(draft.redirect)}, grants::Scope(draft.scope)}, by(request));
    if (registered) return secretPage(context, request, name, *registered);
    return faulty(context, request, draft,
                  std::string(grants::explain(registered.refusal().why)) + ".");
  } catch (const grants::Trouble& trouble) {
    if (trouble.kind() != grants::Trouble::Kind::kFull) throw;
    return faulty(context, request, draft,
                  "There is no room for another application. Remove one first.");
  }
}

/// The word for what became of it; the only refusal is that it is not there.
template <typename Value>
Answer changed(const Context& context, const Request& request,
               const grants::Outcome<Value>& outcome, const char* word) {
  return done(context, request, outcome ? word : "gone");
}

Answer enable(Context& context, const Request& request, const Parameters& form) {
  const grants::ApplicationId client(form.value("client"));
  return changed(context, request, context.store.open().applications.enable(client, by(request)),
                 "enabled");
}

Answer disable(Context& context, const Request& request, const Parameters& form) {
  const grants::ApplicationId client(form.value("client"));
  return changed(context, request, context.store.open().applications.disable(client, by(request)),
                 "disabled");
}

Answer remove(Context& context, const Request& request, const Parameters& form) {
  const grants::ApplicationId client(form.value("client"));
  return changed(context, request, context.store.open().applications.remove(client, by(request)),
                 "removed");
}

Answer ended(const Context& context, const Request& request, const grants::Ended& ended,
             const std::string& shown) {
  const bool wasThere = ended.codes + ended.tokens > 0;
  return done(context, request,
              std::string(wasThere ? "revoked" : "gone") + "&view=access&" + shown);
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

Answer revoke(Context& context, const Request& request, const Parameters& form) {
  const grants::ApplicationId client(form.value("client"));
  const grants::User user(form.value("user"));
  if (user.text().empty()) {
    return ended(context, request, endOwn(context.store.open(), client, by(request)),
                 "application=" + percentEncode(client.text()));
  }
  return ended(context, request, context.store.open().access.endUserWith(user, client, by(request)),
               "user=" + percentEncode(user.text()));
}

Answer revokeAll(Context& context, const Request& request, const Parameters& form) {
  const grants::User user(form.value("user"));
  return ended(context, request, context.store.open().access.endUser(user, by(request)),
               "user=" + percentEncode(user.text()));
}

constexpr struct {
  std::string_view name;
  Answer (*act)(Context& context, const Request& request, const Parameters& form);
} kActions[] = {{"register", registerClient}, {"enable", enable}, {"disable", disable},
                {"remove", remove},           {"revoke", revoke}, {"revoke-all", revokeAll}};

}  // namespace

Answer act(Context& context, const Request& request, const Parameters& form) {
  const std::string asked = form.value("action");
  for (const auto& action : kActions) {
    if (action.name == asked) return action.act(context, request, form);
  }
  return messagePage(context.settings, 400, "This form is not known", "Nothing was changed.");
}

}  // namespace keldoauth::service
