#include "service/pages/admin_pages.h"

#include "service/pages/admin_view.h"
#include "service/pages/html.h"
#include "service/protocol/redirect.h"
#include "service/settings/scopes.h"
#include "utils/oauth_bounds.h"

namespace keldoauth::service {
namespace {

std::string scopeChoices(const ScopeTable& scopes, const std::string& chosen) {
  std::string choices;
  for (const KnownScope& scope : scopes) {
    choices += fill(
        isWithin(scope.name, chosen)
            ? "<label><input type=\"checkbox\" name=\"scope.{}\" value=\"1\" checked> {}</label>\n"
            : "<label><input type=\"checkbox\" name=\"scope.{}\" value=\"1\"> {}</label>\n",
        {scope.name, scope.words});
  }
  return choices;
}

std::string registrationForm(const Context& context, const Request& request, const Draft& draft) {
  const std::string fault =
      draft.fault.empty()
          ? ""
          : fill("<p class=\"fault\" role=\"alert\" id=\"fault\">{}</p>\n", {draft.fault});
  return "<section class=\"card\" aria-labelledby=\"new\">\n"
         "<h2 id=\"new\">Register an application</h2>\n" +
         fault + formStart(context, request, "register") +
         fill(
             "<p class=\"field\"><label for=\"name\">Name</label>\n"
             "<input id=\"name\" name=\"name\" value=\"{}\" required maxlength=\"{}\" "
             "autocomplete=\"off\"></p>\n"
             "<p class=\"field\"><label for=\"redirect\">Redirect address</label>\n"
             "<input id=\"redirect\" name=\"redirect\" type=\"url\" value=\"{}\" required "
             "maxlength=\"1400\" placeholder=\"https://\" autocomplete=\"off\" "
             "aria-describedby=\"redirect-hint\"></p>\n"
             "<p class=\"hint\" id=\"redirect-hint\">Where users return to. https, or http for "
             "127.0.0.1 and localhost.</p>\n",
             {draft.name, std::to_string(KELDOAUTHSERVER::bounds::kDisplayName.max),
              draft.redirect}) +
         "<fieldset><legend>It may ask to</legend>\n" +
         scopeChoices(context.settings.scopes, draft.scope) +
         "</fieldset>\n<div class=\"actions\"><button class=\"primary\">Register</button></div>\n"
         "</form>\n</section>\n";
}

std::string shownAddresses(const grants::Application& client) {
  std::string all;
  for (const grants::RedirectAddress& address : client.addresses) {
    all += (all.empty() ? "" : " ") + address.text();
  }
  return all.empty() ? "no redirect address" : all;
}

std::string applicationActions(const Context& context, const Request& request,
                               const grants::Application& client) {
  const char* change = client.isEnabled ? "disable" : "enable";
  const char* word = client.isEnabled ? "Disable" : "Enable";
  return "<div class=\"actions\">\n" + formStart(context, request, change) +
         fill(
             "<input type=\"hidden\" name=\"client\" value=\"{}\">\n"
             "<button aria-label=\"{} {}\">{}</button>\n</form>\n",
             {client.identifier.text(), word, client.name.text(), word}) +
         fill("<details><summary aria-label=\"Remove {}…\">Remove…</summary>\n",
              {client.name.text()}) +
         formStart(context, request, "remove") +
         fill(
             "<input type=\"hidden\" name=\"client\" value=\"{}\">\n"
             "<p><bdi>{}</bdi> and all access that it has will be gone for good.</p>\n"
             "<button class=\"danger\">Remove for good</button>\n</form>\n</details>\n</div>\n",
             {client.identifier.text(), client.name.text()});
}

std::string applicationItem(const Context& context, const Request& request,
                            const grants::Application& client) {
  return fill("<li class=\"card\">\n<h3>{}</h3>\n", {client.name.text()}) +
         (client.isEnabled ? "<p class=\"badge on\">Enabled</p>\n"
                           : "<p class=\"badge off\">Disabled</p>\n") +
         fill("<dl><dt>Address</dt><dd>{}</dd>\n<dt>Identifier</dt><dd><code>{}</code></dd></dl>\n",
              {shownAddresses(client), client.identifier.text()}) +
         scopeTags(client.scope.text()) + applicationActions(context, request, client) + "</li>\n";
}

}  // namespace

Answer applicationsPage(Context& context, const Request& request, const std::string& done,
                        const Draft& draft) {
  std::string items;
  for (const grants::Application& client : context.store.open().applications.all()) {
    items += applicationItem(context, request, client);
  }
  const std::string list = items.empty() ? "<p class=\"empty\">No application is registered.</p>\n"
                                         : "<ul class=\"cards\">\n" + items + "</ul>\n";
  const std::string registered =
      "<section aria-labelledby=\"registered\">\n<h2 id=\"registered\">Registered</h2>\n"
      "<p class=\"jump\"><a href=\"#new\">Register an application</a></p>\n" +
      list + "</section>\n";
  const std::string form = registrationForm(context, request, draft);
  return view(kApplications, context, request,
              notice(done) + "<div class=\"columns\">\n" +
                  (draft.fault.empty() ? registered + form : form + registered) + "</div>\n",
              draft.fault.empty() ? 200 : 400);
}

Answer secretPage(const Context& context, const Request& request,
                  const grants::ApplicationName& name, const grants::Registered& registered) {
  return view(kApplications, context, request,
              fill("<section class=\"card\" aria-labelledby=\"secret\">\n"
                   "<h2 id=\"secret\">{} is registered</h2>\n"
                   "<p class=\"notice\" role=\"status\">Copy the secret now: it is shown this once "
                   "and never again.</p>\n"
                   "<dl><dt>Identifier</dt><dd><code>{}</code></dd>\n"
                   "<dt>Secret</dt><dd><code class=\"secret\">{}</code></dd></dl>\n"
                   "<p><a class=\"button\" href=\"{}\">Done</a></p>\n</section>\n",
                   {name.text(), registered.identifier.text(), registered.secret->text(),
                    context.settings.link("/admin")}));
}

}  // namespace keldoauth::service
