#include "service/pages/admin_pages.h"
#include "service/pages/form_token.h"
#include "service/pages/frame.h"
#include "service/pages/html.h"
#include "service/settings/scopes.h"
#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

/// Where the rest of what it needs can be found.
std::string discoveryOf(const Settings& settings, const grants::Application& client) {
  return settings.endpoint(isWithin("openid", client.scope.text())
                               ? "/.well-known/openid-configuration"
                               : "/.well-known/oauth-authorization-server");
}

std::string secretSubject(const grants::ApplicationId& identifier, const grants::Secret& secret) {
  return "secret." + identifier.text() + "." + secret.text();
}

std::string row(const char* term, const std::string& value) {
  return fill("<div><dt>{}</dt><dd><code>{}</code></dd></div>\n", {term, value});
}

template <typename Address>
std::string addressRows(const char* term, const std::vector<Address>& addresses) {
  std::string rows;
  for (const Address& address : addresses) rows += row(term, address.text());
  return rows;
}

/// What a form made a moment ago, and nobody else is shown.
std::string secretRow(const Settings& settings, const Request& request,
                      const grants::Application& client,
                      const std::optional<grants::Secret>& secret, const std::string& token) {
  if (!secret) {
    return "<div><dt>Client secret</dt><dd>None: it is a public application. Where one is asked "
           "for, choose “none” or “public client”.</dd></div>\n";
  }
  if (!isFormToken(settings, token, request.user, secretSubject(client.identifier, *secret))) {
    return "<div><dt>Client secret</dt><dd>It was shown when it was made. If nobody has it, renew "
           "it below.</dd></div>\n";
  }
  return fill(
      "<div><dt>Client secret</dt><dd><code class=\"secret\">{}</code>\n"
      "<p class=\"notice\">Copy it now: in a quarter of an hour it is not shown any more.</p>"
      "</dd></div>\n",
      {secret->text()});
}

std::string pasteCard(const Settings& settings, const Request& request,
                      const grants::Application& client,
                      const std::optional<grants::Secret>& secret, const std::string& token) {
  return "<section class=\"card\" aria-labelledby=\"paste\">\n"
         "<h2 id=\"paste\">Paste this into the application</h2>\n<dl class=\"paste\">\n" +
         row("Issuer", settings.issuer) + row("Client identifier", client.identifier.text()) +
         secretRow(settings, request, client, secret, token) +
         addressRows("Redirect address", client.addresses) +
         addressRows("Logout address", client.logoutAddresses) +
         row("Scopes", client.scope.text()) + row("Discovery", discoveryOf(settings, client)) +
         row("Sign-in address", settings.endpoint("/oauth/authorize")) +
         row("Token address", settings.endpoint("/oauth/token")) +
         "</dl>\n<p class=\"hint\">Most applications need the first three alone, and find the rest "
         "by themselves.</p>\n</section>\n";
}

std::string clientField(const grants::Application& client) {
  return fill("<input type=\"hidden\" name=\"client\" value=\"{}\">\n", {client.identifier.text()});
}

std::string changeForm(const Context& context, const Request& request,
                       const grants::Application& client, const Draft& draft) {
  return "<section class=\"card screen\" aria-labelledby=\"change\">\n<h2 id=\"change\">Change "
         "it</h2>\n" +
         formStart(context, request, "change") + clientField(client) +
         draftFields(context.settings, draft, false) +
         "<div class=\"actions\"><button class=\"primary\">Save</button></div>\n</form>\n"
         "</section>\n";
}

std::string renewForm(const Context& context, const Request& request,
                      const grants::Application& client, const grants::Secret& secret) {
  return "<details><summary>Renew the secret…</summary>\n" + formStart(context, request, "renew") +
         clientField(client) +
         fill("<input type=\"hidden\" name=\"was\" value=\"{}\">\n",
              {markOf(context.settings, secret)}) +
         "<p>The old one is no good any more from then on: the application stands still until it "
         "has the new one.</p>\n<button class=\"danger\">Renew the secret</button>\n</form>\n"
         "</details>\n";
}

std::string switchForm(const Context& context, const Request& request,
                       const grants::Application& client) {
  const char* action = client.isEnabled ? "disable" : "enable";
  return formStart(context, request, action) + clientField(client) +
         fill("<button>{}</button>\n</form>\n", {client.isEnabled ? "Disable" : "Enable"});
}

std::string removeForm(const Context& context, const Request& request,
                       const grants::Application& client) {
  return "<details><summary>Remove…</summary>\n" + formStart(context, request, "remove") +
         clientField(client) +
         fill(
             "<p><bdi>{}</bdi> and all access that it has will be gone for good.</p>\n"
             "<button class=\"danger\">Remove for good</button>\n</form>\n</details>\n",
             {client.name.text()});
}

std::string whatItIs(const grants::Application& client) {
  std::string text = client.isEnabled ? "" : "It is <strong>disabled</strong>: nobody gets in. ";
  text += client.kind == grants::ApplicationKind::kPublic
              ? "It is a public application: it runs on its users’ devices and has no secret."
              : "It is a confidential application: it shows a secret.";
  if (client.registeredItself) {
    text += " It registered itself: its name and addresses are its own word.";
  }
  return "<p>" + text + "</p>\n";
}

std::string content(const Context& context, const Request& request, const Parameters& query,
                    const grants::Application& client, const std::optional<grants::Secret>& secret,
                    const Draft& draft) {
  const Settings& settings = context.settings;
  const std::string users = settings.link("/admin?view=access&with=");
  const std::string paste =
      pasteCard(settings, request, client, secret, query.value("secret_token"));
  const std::string change = changeForm(context, request, client, draft);
  return notice(query.value("done")) +
         fill("<p><a href=\"{}\">All applications</a></p>\n", {settings.link("/admin")}) +
         whatItIs(client) +
         fill("<p><a href=\"{}{}\">Who has given it access</a></p>\n",
              {users, percentEncode(client.identifier.text())}) +
         "<div class=\"columns\">\n" + (draft.fault.empty() ? paste + change : change + paste) +
         "</div>\n<h2 class=\"spaced screen\">Switch off, renew, remove</h2>\n<div "
         "class=\"actions\">\n" +
         switchForm(context, request, client) +
         (secret ? renewForm(context, request, client, *secret) : "") +
         removeForm(context, request, client) + "</div>\n";
}

}  // namespace

Answer applicationPage(Context& context, const Request& request, const Parameters& query,
                       const Draft* draft) {
  const grants::ApplicationId identifier(query.value("client"));
  const grants::Applications& applications = context.store.open().applications;
  const auto client = applications.find(identifier);
  if (!client) {
    return messagePage(context.settings, 404, "No such application",
                       "It is not registered, or not any more.", kApplications.path);
  }
  const Draft shown = draft == nullptr ? draftOf(*client) : *draft;
  return framed(kApplications, context.settings, request, client->name.text(),
                content(context, request, query, *client, applications.secretOf(identifier), shown),
                shown.fault.empty() ? 200 : 400);
}

std::string pathWithSecret(const Settings& settings, const Request& request,
                           const grants::ApplicationId& identifier,
                           const std::optional<grants::Secret>& secret, const std::string& done) {
  std::string path = settings.link("/admin?view=application&client=") +
                     percentEncode(identifier.text()) + "&done=" + done;
  if (!secret) return path;
  return path +
         "&secret_token=" + formToken(settings, request.user, secretSubject(identifier, *secret));
}

std::string markOf(const Settings& settings, const grants::Secret& secret) {
  return base64Url(hmacSha256(settings.formKey, "was." + secret.text()));
}

}  // namespace keldoauth::service
