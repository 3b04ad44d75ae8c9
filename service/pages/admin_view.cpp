#include "service/pages/admin_view.h"

#include <array>
#include <ctime>
#include <map>

#include "service/pages/form_token.h"
#include "service/pages/html.h"
#include "service/settings/scopes.h"

namespace keldoauth::service {
namespace {

std::string navigation(const Settings& settings, const View& current) {
  std::string items;
  for (const View& view : {kApplications, kAccess, kLog, kStorage}) {
    const bool here = view.title == std::string(current.title);
    items += fill(here ? "<li><a href=\"{}\" aria-current=\"page\">{}</a></li>\n"
                       : "<li><a href=\"{}\">{}</a></li>\n",
                  {settings.link(view.path), view.title});
  }
  return "<nav aria-label=\"Administration\"><ul>\n" + items + "</ul></nav>\n";
}

}  // namespace

Answer view(const View& current, const Context& context, const Request& request,
            const std::string& content, int status) {
  return page(
      context.settings, status, std::string(current.title) + " – box administration",
      fill("<a class=\"skip\" href=\"#content\">Skip to the content</a>\n"
           "<header class=\"bar\">\n<p class=\"brand\">Sign-in to this box</p>\n"
           "<p class=\"who\">Signed in as <strong>{}</strong></p>\n",
           {request.user}) +
          navigation(context.settings, current) +
          fill("</header>\n<main id=\"content\" class=\"admin\">\n<h1>{}</h1>\n", {current.title}) +
          content + "</main>\n");
}

std::string notice(const std::string& done) {
  static const std::map<std::string, const char*> kTexts{
      {"enabled", "The application is enabled."},
      {"disabled", "The application is disabled. Its tokens do not work while it is."},
      {"removed", "The application is removed, with all access that it had."},
      {"revoked", "The access is revoked."},
      {"gone", "Somebody else has already removed that."}};
  const auto found = kTexts.find(done);
  if (found == kTexts.end()) return {};
  return fill("<p class=\"notice\" role=\"status\">{}</p>\n", {found->second});
}

std::string timeText(long long seconds) {
  const auto when = static_cast<std::time_t>(seconds);
  std::tm parts{};
  std::array<char, 32> text{};
  if (gmtime_r(&when, &parts) == nullptr ||
      std::strftime(text.data(), text.size(), "%Y-%m-%d %H:%M:%S", &parts) == 0) {
    return "?";
  }
  return fill("<time datetime=\"{}Z\">{} UTC</time>", {text.data(), text.data()});
}

std::string scopeTags(const std::string& scope) {
  std::string tags;
  for (const std::string& name : scopeNames(scope)) {
    tags += fill("<li>{}</li>", {name});
  }
  return R"(<ul class="tags" aria-label="Scopes">)" + tags + "</ul>\n";
}

std::string formStart(const Context& context, const Request& request, const char* action) {
  return fill(
      "<form method=\"post\" action=\"{}\">\n"
      "<input type=\"hidden\" name=\"form_token\" value=\"{}\">\n"
      "<input type=\"hidden\" name=\"action\" value=\"{}\">\n",
      {context.settings.link("/admin"), formToken(context.settings, request.user, kAdminSubject),
       action});
}

}  // namespace keldoauth::service
