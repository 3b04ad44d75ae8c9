#include "service/pages/admin_draft.h"

#include <algorithm>

#include "service/pages/html.h"
#include "service/protocol/clients.h"
#include "service/settings/scopes.h"
#include "utils/oauth_bounds.h"

namespace keldoauth::service {
namespace {

using grants::ApplicationKind;

template <typename Address>
std::string linesOf(const std::vector<Address>& addresses) {
  std::string lines;
  for (const Address& address : addresses) {
    lines += (lines.empty() ? "" : "\n") + address.text();
  }
  return lines;
}

bool isAmong(const std::vector<std::string>& words, const std::string& word) {
  return std::find(words.begin(), words.end(), word) != words.end();
}

std::string faultOfAddresses(const std::string& typed, const std::string& before,
                             ApplicationKind kind) {
  const std::vector<std::string> kept = typedWords(before);
  for (const std::string& address : typedWords(typed)) {
    if (isAmong(kept, address)) continue;
    if (address.size() > kMaxRedirect) return "An address is too long.";
    if (isRedirectAddress(address, kind)) continue;
    return kind == ApplicationKind::kPublic
               ? "An address must start with https://, with http:// for 127.0.0.1 and localhost, "
                 "or with a scheme of its own that has a dot and one slash behind it "
                 "(com.example.app:/back); none may have a fragment."
               : "An address must start with https://, or with http:// for 127.0.0.1 and "
                 "localhost, and have no fragment.";
  }
  return {};
}

std::string area(const char* name, const char* label, const std::string& text, const char* hint) {
  return fill(
      "<p class=\"field\"><label for=\"{}\">{}</label>\n"
      "<textarea id=\"{}\" name=\"{}\" rows=\"2\" maxlength=\"2048\" placeholder=\"https://\" "
      "autocomplete=\"off\" autocapitalize=\"none\" spellcheck=\"false\" dir=\"ltr\" "
      "aria-describedby=\"{}-hint\">\n{}</textarea></p>\n<p class=\"hint\" id=\"{}-hint\">{}</p>\n",
      {name, label, name, name, name, text, name, hint});
}

std::string kindChoice(ApplicationKind kind) {
  const bool isPublic = kind == ApplicationKind::kPublic;
  return fill(
      "<fieldset><legend>Where it runs</legend>\n"
      "<label><input type=\"radio\" name=\"kind\" value=\"confidential\"{}> On a server, where it "
      "can keep a secret (confidential)</label>\n"
      "<label><input type=\"radio\" name=\"kind\" value=\"public\"{}> On the devices of its users: "
      "an app, a program, a page’s script (public)</label>\n</fieldset>\n",
      {isPublic ? "" : " checked", isPublic ? " checked" : ""});
}

std::string scopeChoices(const Settings& settings, const std::string& chosen) {
  std::string choices;
  for (const std::string& name : scopeNames(offeredScopes(settings, chosen))) {
    const std::string words = settings.scopes.inWords(name);
    choices += fill(
        "<label><input type=\"checkbox\" name=\"scope.{}\" value=\"1\"{}> <span>{}{}{}{}</span>"
        "</label>\n",
        {name, isWithin(name, chosen) ? " checked" : "", words, words == name ? "" : " (",
         words == name ? "" : name, words == name ? "" : ")"});
  }
  return "<fieldset><legend>It may ask to</legend>\n" + choices + "</fieldset>\n";
}

std::string pkceChoice(bool needsPkce) {
  return fill(
      "<fieldset><legend>Protection of the sign-in</legend>\n"
      "<label><input type=\"checkbox\" name=\"without_pkce\" value=\"1\"{}> <span>It may sign "
      "users in without PKCE</span></label>\n</fieldset>\n"
      "<p class=\"hint\">Only for an application that keeps a secret and does not know PKCE. A "
      "public one never may.</p>\n",
      {needsPkce ? "" : " checked"});
}

/// What few applications need, open when this one has something in it.
std::string moreFields(const Draft& draft, bool hasPkceChoice) {
  const bool isOpen = !draft.needsPkce || !draft.logoutAddresses.empty();
  return (isOpen ? "<details open>" : "<details>") + std::string("<summary>More</summary>\n") +
         area("logout", "Logout addresses", draft.logoutAddresses,
              "Where users may return to after they sign out. Mostly there are none.") +
         (hasPkceChoice ? pkceChoice(draft.needsPkce) : "") + "</details>\n";
}

}  // namespace

std::vector<std::string> typedWords(const std::string& typed) {
  std::string blanks = typed;
  std::replace_if(
      blanks.begin(), blanks.end(), [](char c) { return c == '\r' || c == '\n' || c == '\t'; },
      ' ');
  return scopeNames(blanks);
}

std::string offeredScopes(const Settings& settings, const std::string& scope) {
  std::string all;
  for (const KnownScope& known : settings.scopes) all += known.name + " ";
  return tidyScope(all + scope);
}

Draft readDraft(const Parameters& form, const std::string& offered) {
  Draft draft;
  draft.name = form.value("name");
  draft.kind =
      form.value("kind") == "public" ? ApplicationKind::kPublic : ApplicationKind::kConfidential;
  draft.addresses = form.value("redirect");
  draft.logoutAddresses = form.value("logout");
  draft.needsPkce = !form.has("without_pkce") || draft.kind == ApplicationKind::kPublic;
  draft.scope.clear();
  for (const std::string& name : scopeNames(offered)) {
    if (form.has("scope." + name)) draft.scope = tidyScope(draft.scope + " " + name);
  }
  return draft;
}

Draft draftOf(const grants::Application& application) {
  Draft draft;
  draft.name = application.name.text();
  draft.kind = application.kind;
  draft.addresses = linesOf(application.addresses);
  draft.logoutAddresses = linesOf(application.logoutAddresses);
  draft.scope = application.scope.text();
  draft.needsPkce = application.needsPkce;
  return draft;
}

std::string faultOf(const Draft& draft, const Draft& before) {
  std::string fault = draft.name == before.name ? "" : faultOfName(draft.name);
  if (fault.empty()) fault = faultOfAddresses(draft.addresses, before.addresses, draft.kind);
  if (fault.empty()) {
    fault = faultOfAddresses(draft.logoutAddresses, before.logoutAddresses, draft.kind);
  }
  if (!fault.empty()) return fault;
  if (draft.kind == ApplicationKind::kPublic && typedWords(draft.addresses).empty()) {
    return "A public application needs an address to return to.";
  }
  return draft.scope.empty() ? "Choose at least one thing that it may ask to do." : "";
}

std::string draftFields(const Settings& settings, const Draft& draft, bool isNew) {
  return (draft.fault.empty()
              ? ""
              : fill("<p class=\"fault\" role=\"alert\" id=\"fault\">{}</p>\n", {draft.fault})) +
         fill(
             "<p class=\"field\"><label for=\"name\">Name</label>\n"
             "<input id=\"name\" name=\"name\" value=\"{}\" dir=\"auto\" required maxlength=\"{}\" "
             "autocomplete=\"off\"></p>\n",
             {draft.name, std::to_string(KELDOAUTHSERVER::bounds::kDisplayName.max)}) +
         (isNew ? kindChoice(draft.kind) : "") +
         area("redirect", "Redirect addresses", draft.addresses,
              "Where users return to, one in each line: https, or http for 127.0.0.1 and "
              "localhost, where a public application may have any port. None for an application "
              "that only acts for itself.") +
         scopeChoices(settings, draft.scope) +
         moreFields(draft, isNew || draft.kind == ApplicationKind::kConfidential);
}

}  // namespace keldoauth::service
