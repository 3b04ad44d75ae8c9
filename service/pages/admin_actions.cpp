#include "service/pages/admin_actions.h"

#include <string_view>
#include <vector>

#include "service/pages/admin_pages.h"
#include "service/pages/html.h"
#include "service/protocol/clients.h"
#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

// Each leads back to a page that can be loaded again without doing it again; and
// sent once more, each does nothing more.

Answer done(const Context& context, const Request& request, const std::string& word) {
  return redirectAnswer(request, context.settings.link("/admin?done=") + word);
}

grants::Actor by(const Request& request) {
  return grants::Actor(request.user);
}

std::string sentence(const grants::Refusal& refusal) {
  return std::string(grants::explain(refusal.why)) + ".";
}

// New ones ------------------------------------------------------------------------

grants::NewApplication applicationIn(const Draft& draft) {
  grants::NewApplication application{grants::ApplicationName(draft.name),
                                     addressesIn<grants::RedirectAddress>(draft.addresses),
                                     grants::Scope(draft.scope), draft.kind};
  application.logoutAddresses = addressesIn<grants::LogoutAddress>(draft.logoutAddresses);
  application.needsPkce = draft.needsPkce;
  return application;
}

/// To what the same form registered when it was sent before.
Answer sentAgain(Context& context, const Request& request, const Draft& draft,
                 const grants::ApplicationId& identifier) {
  const grants::Applications& applications = context.store.open().applications;
  const auto there = applications.find(identifier);
  const bool isSame = there && there->name.text() == draft.name;
  return redirectAnswer(
      request, pathWithSecret(context.settings, request, identifier,
                              applications.secretOf(identifier), isSame ? "registered" : "again"));
}

Answer add(Context& context, const Request& request, Draft draft, const std::string& once) {
  grants::NewApplication application = applicationIn(draft);
  if (!once.empty()) application.identifier = identifierFrom(context.settings, once);
  try {
    const auto added = context.store.open().applications.add(application, by(request));
    if (added) {
      return redirectAnswer(request, pathWithSecret(context.settings, request, added->identifier,
                                                    added->secret, "registered"));
    }
    if (added.refusal().why == grants::Why::kTaken) {
      return sentAgain(context, request, draft, *application.identifier);
    }
    draft.fault = sentence(added.refusal());
  } catch (const grants::Trouble& trouble) {
    if (trouble.kind() != grants::Trouble::Kind::kFull) throw;
    draft.fault = "There is no room for another application. Remove one first.";
  }
  return registerPage(context, request, draft, once);
}

Answer registerClient(Context& context, const Request& request, const Parameters& form) {
  Draft draft = readDraft(form, offeredScopes(context.settings));
  const std::string once = form.value("once");
  draft.fault = faultOf(draft);
  if (!draft.fault.empty()) return registerPage(context, request, draft, once);
  return add(context, request, draft, once);
}

// Those that are there ------------------------------------------------------------

grants::ApplicationId clientIn(const Parameters& form) {
  return grants::ApplicationId(form.value("client"));
}

/// The word for what became of it; the only refusal is that it is not there.
template <typename Value>
Answer changed(const Context& context, const Request& request, const Parameters& form,
               const grants::Outcome<Value>& outcome, const char* word) {
  if (!outcome) return done(context, request, "gone");
  return redirectAnswer(request,
                        pathWithSecret(context.settings, request, clientIn(form), {}, word));
}

Answer enable(Context& context, const Request& request, const Parameters& form) {
  return changed(context, request, form,
                 context.store.open().applications.enable(clientIn(form), by(request)), "enabled");
}

Answer disable(Context& context, const Request& request, const Parameters& form) {
  return changed(context, request, form,
                 context.store.open().applications.disable(clientIn(form), by(request)),
                 "disabled");
}

Answer remove(Context& context, const Request& request, const Parameters& form) {
  const auto removed = context.store.open().applications.remove(clientIn(form), by(request));
  return done(context, request, removed ? "removed" : "gone");
}

/// What stays as it was is left alone, however it is stored.
grants::ApplicationChange changeTo(const Draft& draft, const Draft& before) {
  grants::ApplicationChange change;
  if (draft.name != before.name) change.name = grants::ApplicationName(draft.name);
  if (typedWords(draft.addresses) != typedWords(before.addresses)) {
    change.addresses = addressesIn<grants::RedirectAddress>(draft.addresses);
  }
  if (typedWords(draft.logoutAddresses) != typedWords(before.logoutAddresses)) {
    change.logoutAddresses = addressesIn<grants::LogoutAddress>(draft.logoutAddresses);
  }
  if (draft.scope != tidyScope(before.scope)) change.scope = grants::Scope(draft.scope);
  if (draft.needsPkce != before.needsPkce) change.needsPkce = draft.needsPkce;
  return change;
}

bool isAny(const grants::ApplicationChange& change) {
  return change.name || change.addresses || change.logoutAddresses || change.scope ||
         change.needsPkce;
}

Answer change(Context& context, const Request& request, const Parameters& form) {
  grants::Applications& applications = context.store.open().applications;
  const auto client = applications.find(clientIn(form));
  if (!client) return done(context, request, "gone");
  const Draft before = draftOf(*client);
  Draft draft = readDraft(form, offeredScopes(context.settings, before.scope));
  draft.kind = before.kind;
  if (draft.kind == grants::ApplicationKind::kPublic) draft.needsPkce = true;
  draft.fault = faultOf(draft, before);
  if (!draft.fault.empty()) return applicationPage(context, request, form, &draft);
  const grants::ApplicationChange wanted = changeTo(draft, before);
  if (isAny(wanted)) {
    const auto outcome = applications.change(client->identifier, wanted, by(request));
    if (!outcome && outcome.refusal().why == grants::Why::kNoApplication) {
      return done(context, request, "gone");
    }
    if (!outcome) {
      draft.fault = sentence(outcome.refusal());
      return applicationPage(context, request, form, &draft);
    }
  }
  return redirectAnswer(
      request, pathWithSecret(context.settings, request, client->identifier, {}, "changed"));
}

/// The second of two clicks finds another secret than the form was shown for, and
/// is shown that.
Answer renew(Context& context, const Request& request, const Parameters& form) {
  grants::Applications& applications = context.store.open().applications;
  const grants::ApplicationId identifier = clientIn(form);
  std::optional<grants::Secret> secret = applications.secretOf(identifier);
  if (!secret) return done(context, request, "gone");
  if (equalSecrets(form.value("was"), markOf(context.settings, *secret))) {
    const auto renewed = applications.renewSecret(identifier, by(request));
    if (!renewed) return done(context, request, "gone");
    secret = *renewed;
  }
  return redirectAnswer(request,
                        pathWithSecret(context.settings, request, identifier, secret, "renewed"));
}

// Access --------------------------------------------------------------------------

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
  const grants::ApplicationId client = clientIn(form);
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
} kActions[] = {{"register", registerClient}, {"change", change},       {"renew", renew},
                {"enable", enable},           {"disable", disable},     {"remove", remove},
                {"revoke", revoke},           {"revoke-all", revokeAll}};

}  // namespace

Answer act(Context& context, const Request& request, const Parameters& form) {
  const std::string asked = form.value("action");
  for (const auto& action : kActions) {
    if (action.name == asked) return action.act(context, request, form);
  }
  return messagePage(context.settings, 400, "This form is not known", "Nothing was changed.");
}

}  // namespace keldoauth::service
