#include "service/pages/admin_pages.h"
#include "service/pages/frame.h"
#include "service/pages/html.h"
#include "service/text/encoding.h"
#include "utils/oauth_utils.h"

namespace keldoauth::service {
namespace {

constexpr std::size_t kShortIdentifier = 8;
constexpr unsigned int kOnceLength = 64;

std::string badges(const grants::Application& client) {
  const bool isPublic = client.kind == grants::ApplicationKind::kPublic;
  std::string text = "<p class=\"badges\">";
  if (!client.isEnabled) text += "<span class=\"badge warn\">Disabled</span>\n";
  text += fill("<span class=\"badge off\">{}</span>\n", {isPublic ? "Public" : "Confidential"});
  if (client.registeredItself) text += "<span class=\"badge off\">Registered itself</span>\n";
  if (!client.needsPkce) text += "<span class=\"badge off\">Without PKCE</span>\n";
  return text + "</p>\n";
}

std::string shownAddresses(const grants::Application& client) {
  std::string all;
  for (const grants::RedirectAddress& address : client.addresses) {
    all += fill("<li>{}</li>\n", {address.text()});
  }
  return all.empty() ? "<p class=\"hint\">Acts for itself alone: no address to return to.</p>\n"
                     : "<ul class=\"plain\" aria-label=\"Redirect addresses\">\n" + all + "</ul>\n";
}

std::string applicationItem(const Settings& settings, const grants::Application& client) {
  const std::string& identifier = client.identifier.text();
  return fill("<li class=\"card\">\n<h2><a href=\"{}{}\"><bdi>{}</bdi></a></h2>\n",
              {settings.link("/admin?view=application&client="), percentEncode(identifier),
               client.name.text()}) +
         badges(client) + shownAddresses(client) +
         fill("<p class=\"hint\">Identifier <code>{}…</code></p>\n</li>\n",
              {identifier.substr(0, kShortIdentifier)});
}

}  // namespace

Answer applicationsPage(Context& context, const Request& request, const Parameters& query) {
  const Settings& settings = context.settings;
  const std::string contains = query.value("contains");
  const int page = pageNumber(query.value("page"));
  const auto found =
      context.store.open().applications.page(contains, {kRowsOfPage, (page - 1) * kRowsOfPage});
  std::string items;
  for (const grants::Application& client : found.items) items += applicationItem(settings, client);
  return view(
      kApplications, context, request,
      notice(query.value("done")) +
          fill("<p class=\"actions\"><a class=\"button primary\" href=\"{}\">Register an "
               "application</a></p>\n",
               {settings.link("/admin?view=register")}) +
          searchForm(settings, "", "Search", contains, "Part of a name, or a whole identifier.") +
          (items.empty() ? "<p class=\"empty\">No application is registered" +
                               std::string(contains.empty() ? "" : " that fits") + ".</p>\n"
                         : "<ul class=\"cards\">\n" + items + "</ul>\n") +
          turns(settings, {page, found.total, "applications",
                           "/admin?contains=" + percentEncode(contains) + "&page="}));
}

Answer registerPage(const Context& context, const Request& request, const Draft& draft,
                    const std::string& once) {
  const std::string number = once.empty() ? KELDOAUTHSERVER::getRandomStr(kOnceLength) : once;
  return framed(kApplications, context.settings, request, "Register an application",
                "<section class=\"card narrow\">\n" + formStart(context, request, "register") +
                    fill("<input type=\"hidden\" name=\"once\" value=\"{}\">\n", {number}) +
                    draftFields(context.settings, draft, true) +
                    fill("<div class=\"actions\"><button class=\"primary\">Register</button>\n"
                         "<a class=\"button\" href=\"{}\">Cancel</a></div>\n</form>\n</section>\n",
                         {context.settings.link("/admin")}),
                draft.fault.empty() ? 200 : 400);
}

grants::ApplicationId identifierFrom(const Settings& settings, const std::string& once) {
  constexpr char kDigits[] = "0123456789abcdef";
  std::string text;
  for (const char c : hmacSha256(settings.formKey, "identifier." + once)) {
    const auto byte = static_cast<unsigned char>(c);
    text += kDigits[byte >> 4U];
    text += kDigits[byte & 15U];
  }
  return grants::ApplicationId(text);
}

}  // namespace keldoauth::service
