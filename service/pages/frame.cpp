#include "service/pages/frame.h"

#include <algorithm>
#include <map>
#include <vector>

#include "service/pages/form_token.h"
#include "service/pages/html.h"
#include "service/pages/sign_in.h"
#include "service/settings/scopes.h"
#include "service/text/encoding.h"
#include "service/text/utc.h"

namespace keldoauth::service {
namespace {

std::string navigation(const Settings& settings, const Request& request, const View& current) {
  std::vector<View> views{kAccount};
  if (isAdministrator(settings, request)) {
    views.insert(views.end(), {kApplications, kAccess, kLog, kStorage});
  }
  std::string items;
  for (const View& view : views) {
    const bool here = view.title == std::string(current.title);
    items += fill(here ? "<li><a href=\"{}\" aria-current=\"page\">{}</a></li>\n"
                       : "<li><a href=\"{}\">{}</a></li>\n",
                  {settings.link(view.path), view.title});
  }
  return "<nav aria-label=\"This box\"><ul>\n" + items + "</ul></nav>\n";
}

std::string turnLink(const Settings& settings, const Turn& turn, long long page, const char* word) {
  return fill("<a class=\"button\" href=\"{}\">{}</a>\n",
              {settings.link(turn.addressOf) + std::to_string(page), word});
}

}  // namespace

bool isAdministrator(const Settings& settings, const Request& request) {
  return settings.administrators.count(request.user) != 0;
}

Answer framed(const View& current, const Settings& settings, const Request& request,
              const std::string& heading, const std::string& content, int status) {
  return page(settings, status, heading + " – sign-in to this box",
              fill("<link rel=\"stylesheet\" href=\"{}\">\n", {settings.link("/style/lists.css")}) +
                  "<a class=\"skip\" href=\"#content\">Skip to the content</a>\n"
                  "<header class=\"bar\">\n<p class=\"brand\">Sign-in to this box</p>\n" +
                  whoLine(settings, request) + navigation(settings, request, current) +
                  fill("</header>\n<main id=\"content\" class=\"wide\">\n<h1><bdi>{}</bdi></h1>\n",
                       {heading}) +
                  content + "</main>\n");
}

Answer view(const View& current, const Context& context, const Request& request,
            const std::string& content, int status) {
  return framed(current, context.settings, request, current.title, content, status);
}

std::string notice(const std::string& done) {
  static const std::map<std::string, const char*> kTexts{
      {"again",
       "That form had been sent before. This is what it registered; for another "
       "application open a new form."},
      {"changed", "The application is changed. What was granted before stays as it was."},
      {"enabled", "The application is enabled."},
      {"disabled", "The application is disabled. Its tokens do not work while it is."},
      {"ended", "That access is taken back."},
      {"gone", "That is gone already: there was nothing more to do."},
      {"registered", "The application is registered."},
      {"removed", "The application is removed, with all access that it had."},
      {"renewed", "The application has a new secret. The old one is no good any more."},
      {"revoked", "The access is revoked."}};
  const auto found = kTexts.find(done);
  if (found == kTexts.end()) return {};
  return fill("<p class=\"notice\" role=\"status\">{}</p>\n", {found->second});
}

std::string whoLine(const Settings& settings, const Request& request) {
  const std::string form = signOutForm(settings, request);
  return fill("<div class=\"who\">\n<p>Signed in as <strong><bdi>{}</bdi></strong>. Not you?</p>\n",
              {request.user}) +
         (form.empty() ? "<p>Close all windows of the browser: it remembers the password.</p>\n"
                       : form) +
         "</div>\n";
}

std::string timeText(long long seconds) {
  const std::optional<std::string> text = utcText(seconds);
  return text ? fill("<time datetime=\"{}Z\">{} UTC</time>", {*text, *text}) : "?";
}

std::string timeRow(const char* term, long long seconds) {
  if (seconds == 0) return {};
  return fill("<div><dt>{}</dt><dd>", {term}) + timeText(seconds) + "</dd></div>\n";
}

std::string scopeTags(const std::string& scope) {
  std::string tags;
  for (const std::string& name : scopeNames(scope)) tags += fill("<li>{}</li>", {name});
  return R"(<ul class="tags" aria-label="Scopes">)" + tags + "</ul>\n";
}

std::string scopeWords(const Settings& settings, const std::string& scope) {
  std::string items;
  for (const std::string& name : scopeNames(scope)) {
    items += fill("<li>{}</li>\n", {settings.scopes.inWords(name)});
  }
  return "<ul class=\"scopes\">\n" + items + "</ul>\n";
}

int pageNumber(const std::string& text) {
  return static_cast<int>(std::clamp(number(text), 1LL, 1000LL));
}

std::string turns(const Settings& settings, const Turn& turn) {
  const long long first = (turn.page - 1LL) * kRowsOfPage + 1;
  const long long last = std::min<long long>(turn.total, first + kRowsOfPage - 1);
  const long long pages = (turn.total + kRowsOfPage - 1) / kRowsOfPage;
  if (pages <= 1 && turn.page == 1) return {};
  std::string text =
      fill("<p class=\"hint\">{} of {} {}</p>\n",
           {first > last ? "None" : std::to_string(first) + " to " + std::to_string(last),
            std::to_string(turn.total), turn.what});
  text += fill("<nav class=\"actions\" aria-label=\"Pages of {}\">\n", {turn.what});
  if (turn.page > 2) text += turnLink(settings, turn, 1, "First");
  if (turn.page > 1) {
    text += turnLink(settings, turn, std::min<long long>(turn.page - 1, pages), "Previous");
  }
  if (turn.page < pages) text += turnLink(settings, turn, turn.page + 1, "Next");
  if (turn.page < pages - 1) text += turnLink(settings, turn, pages, "Last");
  return text + "</nav>\n";
}

std::string searchForm(const Settings& settings, const char* view, const char* label,
                       const std::string& contains, const char* hint) {
  const std::string_view word(view);
  return fill("<form method=\"get\" action=\"{}\" class=\"search\" role=\"search\">\n",
              {settings.link("/admin")}) +
         (word.empty() ? ""
                       : fill("<input type=\"hidden\" name=\"view\" value=\"{}\">\n", {word})) +
         fill(
             "<label for=\"contains\">{}</label>\n"
             "<input id=\"contains\" name=\"contains\" type=\"search\" dir=\"auto\" value=\"{}\" "
             "autocomplete=\"off\" aria-describedby=\"contains-hint\">\n"
             "<button>Search</button>\n</form>\n<p class=\"hint\" id=\"contains-hint\">{}</p>\n",
             {label, contains, hint});
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
