#include "examples/cgi/admin_pages.h"

#include <algorithm>
#include <array>
#include <ctime>
#include <map>

#include "examples/cgi/admin_rows.h"
#include "examples/cgi/csrf.h"
#include "examples/cgi/encoding.h"
#include "examples/cgi/html.h"
#include "examples/cgi/redirect.h"
#include "examples/cgi/scopes.h"

namespace service {
namespace {

struct View {
  const char* title;
  const char* address;
};

constexpr View kApplications{"Applications", "/admin"};
constexpr View kAccess{"Access", "/admin?view=access"};
constexpr View kLog{"Audit log", "/admin?view=log"};
constexpr View kStorage{"Storage", "/admin?view=storage"};

std::string navigation(const View& current) {
  std::string items;
  for (const View& view : {kApplications, kAccess, kLog, kStorage}) {
    const bool here = view.title == std::string(current.title);
    items += fill(here ? "<li><a href=\"{}\" aria-current=\"page\">{}</a></li>\n"
                       : "<li><a href=\"{}\">{}</a></li>\n",
                  {view.address, view.title});
  }
  return "<nav aria-label=\"Administration\"><ul>\n" + items + "</ul></nav>\n";
}

Answer view(const View& current, const std::string& user, const std::string& content,
            int status = 200) {
  return page(
      status, std::string(current.title) + " – box administration",
      fill("<a class=\"skip\" href=\"#content\">Skip to the content</a>\n"
           "<header class=\"bar\">\n<p class=\"brand\">Sign-in to this box</p>\n"
           "<p class=\"who\">Signed in as <strong>{}</strong></p>\n",
           {user}) +
          navigation(current) +
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
  return "<ul class=\"tags\" aria-label=\"Scopes\">" + tags + "</ul>\n";
}

std::string formStart(const std::string& user, const char* action) {
  return fill(
      "<form method=\"post\" action=\"/admin\">\n"
      "<input type=\"hidden\" name=\"form_token\" value=\"{}\">\n"
      "<input type=\"hidden\" name=\"action\" value=\"{}\">\n",
      {formToken(user, kAdminSubject), action});
}

// Applications ----------------------------------------------------------------

std::string scopeChoices(const std::string& chosen) {
  std::string choices;
  for (const Scope& scope : kScopes) {
    choices += fill(
        isWithin(scope.name, chosen)
            ? "<label><input type=\"checkbox\" name=\"scope.{}\" value=\"1\" checked> {}</label>\n"
            : "<label><input type=\"checkbox\" name=\"scope.{}\" value=\"1\"> {}</label>\n",
        {scope.name, scope.words});
  }
  return choices;
}

std::string registrationForm(const std::string& user, const Draft& draft) {
  const std::string fault =
      draft.fault.empty()
          ? ""
          : fill("<p class=\"fault\" role=\"alert\" id=\"fault\">{}</p>\n", {draft.fault});
  return "<section class=\"card\" aria-labelledby=\"new\">\n"
         "<h2 id=\"new\">Register an application</h2>\n" +
         fault + formStart(user, "register") +
         fill(
             "<p class=\"field\"><label for=\"name\">Name</label>\n"
             "<input id=\"name\" name=\"name\" value=\"{}\" required maxlength=\"64\" "
             "autocomplete=\"off\"></p>\n"
             "<p class=\"field\"><label for=\"redirect\">Redirect address</label>\n"
             "<input id=\"redirect\" name=\"redirect\" type=\"url\" value=\"{}\" required "
             "maxlength=\"1400\" placeholder=\"https://\" autocomplete=\"off\" "
             "aria-describedby=\"redirect-hint\"></p>\n"
             "<p class=\"hint\" id=\"redirect-hint\">Where users return to. https, or http for "
             "127.0.0.1 and localhost.</p>\n",
             {draft.name, draft.redirect}) +
         "<fieldset><legend>It may ask to</legend>\n" + scopeChoices(draft.scope) +
         "</fieldset>\n<div class=\"actions\"><button class=\"primary\">Register</button></div>\n"
         "</form>\n</section>\n";
}

std::string shownAddresses(const Client& client) {
  if (client.redirects == kNoRedirect) return "no redirect address";
  return client.redirects;
}

std::string applicationActions(const std::string& user, const Client& client) {
  const char* change = client.enabled ? "disable" : "enable";
  const char* word = client.enabled ? "Disable" : "Enable";
  return "<div class=\"actions\">\n" + formStart(user, change) +
         fill(
             "<input type=\"hidden\" name=\"client\" value=\"{}\">\n"
             "<button aria-label=\"{} {}\">{}</button>\n</form>\n",
             {client.identifier, word, client.name, word}) +
         fill("<details><summary aria-label=\"Remove {}…\">Remove…</summary>\n", {client.name}) +
         formStart(user, "remove") +
         fill(
             "<input type=\"hidden\" name=\"client\" value=\"{}\">\n"
             "<p>{} and all access that it has will be gone for good.</p>\n"
             "<button class=\"danger\">Remove for good</button>\n</form>\n</details>\n</div>\n",
             {client.identifier, client.name});
}

std::string applicationItem(const std::string& user, const Client& client) {
  return fill("<li class=\"card\">\n<h3>{}</h3>\n", {client.name}) +
         (client.enabled ? "<p class=\"badge on\">Enabled</p>\n"
                         : "<p class=\"badge off\">Disabled</p>\n") +
         fill("<dl><dt>Address</dt><dd>{}</dd>\n<dt>Identifier</dt><dd><code>{}</code></dd></dl>\n",
              {shownAddresses(client), client.identifier}) +
         scopeTags(client.scope) + applicationActions(user, client) + "</li>\n";
}

// Access ----------------------------------------------------------------------

std::map<std::string, std::string> clientNames() {
  std::map<std::string, std::string> names;
  for (const Client& client : allClients()) names[client.identifier] = client.name;
  return names;
}

std::string nameOf(const std::map<std::string, std::string>& names, const std::string& clientId) {
  const auto found = names.find(clientId);
  return found == names.end() ? "An application that was removed" : found->second;
}

std::string userItems(const std::vector<Access>& all,
                      const std::map<std::string, std::string>& names) {
  std::map<std::string, int> counts;
  for (const Access& access : all) ++counts[access.user];
  std::string items;
  for (const auto& [name, count] : counts) {
    // In its own flow an application stands where users stand.
    const auto own = names.find(name);
    items += fill("<li><a href=\"/admin?view=access&amp;user=" + percentEncode(name) +
                      "\">{}</a> <span class=\"count\">{}</span></li>\n",
                  {own == names.end() ? name : own->second + " (itself)", std::to_string(count)});
  }
  if (items.empty()) return "<p class=\"empty\">Nobody has given any access.</p>\n";
  return "<ul class=\"users\">\n" + items + "</ul>\n";
}

std::string accessItem(const std::string& user, const Access& access, const std::string& name) {
  const bool isToken = access.kind == Access::Kind::kToken;
  const bool expired = access.expires < std::time(nullptr);
  return fill("<li class=\"card\">\n<h3>{}</h3>\n", {name}) +
         fill("<p class=\"badge {}\">{}</p>\n",
              {expired ? "off" : "on",
               isToken ? (expired ? "Can be renewed" : "In use") : "Code, not redeemed yet"}) +
         fill("<dl><dt>{}</dt><dd>", {expired ? "Expired" : "Expires"}) + timeText(access.expires) +
         "</dd></dl>\n" + scopeTags(access.scope) + "<div class=\"actions\">\n" +
         formStart(user, "revoke") +
         fill(
             "<input type=\"hidden\" name=\"access\" value=\"{}\">\n"
             "<input type=\"hidden\" name=\"user\" value=\"{}\">\n"
             "<button class=\"danger\" aria-label=\"Revoke the access of {}\">Revoke</button>\n"
             "</form></div>\n</li>\n",
             {access.handle(), access.user, name});
}

std::string accessOfUser(const std::string& user, const std::string& shown,
                         const std::vector<Access>& all,
                         const std::map<std::string, std::string>& names) {
  std::string items;
  for (const Access& access : all) {
    if (access.user == shown) items += accessItem(user, access, nameOf(names, access.clientId));
  }
  const std::string heading = fill("<h2 class=\"spaced\">Access for {}</h2>\n",
                                   {names.count(shown) > 0 ? nameOf(names, shown) : shown});
  if (items.empty()) return heading + "<p class=\"empty\">No application has access.</p>\n";
  return heading + "<ul class=\"cards\">\n" + items + "</ul>\n";
}

// Audit log -------------------------------------------------------------------

/// No log is so long that it had more pages.
int pageNumber(const std::string& text) {
  return static_cast<int>(std::clamp(number(text), 1LL, 1000LL));
}

std::string logTurn(const std::string& filter, int page, const char* word) {
  return fill("<a class=\"button\" href=\"/admin?view=log&amp;filter={}&amp;page={}\">{}</a>\n",
              {percentEncode(filter), std::to_string(page), word});
}

std::string logTurns(const std::string& filter, int page, bool more) {
  if (page == 1 && !more) return {};
  return "<nav class=\"actions\" aria-label=\"Pages of the log\">\n" +
         (page > 1 ? logTurn(filter, page - 1, "Newer") : "") +
         (more ? logTurn(filter, page + 1, "Older") : "") + "</nav>\n";
}

}  // namespace

Answer applicationsPage(const std::string& user, const std::string& done, const Draft& draft) {
  std::string items;
  for (const Client& client : allClients()) items += applicationItem(user, client);
  const std::string list = items.empty() ? "<p class=\"empty\">No application is registered.</p>\n"
                                         : "<ul class=\"cards\">\n" + items + "</ul>\n";
  const std::string registered =
      "<section aria-labelledby=\"registered\">\n<h2 id=\"registered\">Registered</h2>\n" + list +
      "</section>\n";
  const std::string form = registrationForm(user, draft);
  return view(kApplications, user,
              notice(done) + "<div class=\"columns\">\n" +
                  (draft.fault.empty() ? registered + form : form + registered) + "</div>\n",
              draft.fault.empty() ? 200 : 400);
}

Answer accessPage(const std::string& user, const std::string& done, const std::string& shown) {
  const std::map<std::string, std::string> names = clientNames();
  const std::vector<Access> all = allAccess();
  return view(kAccess, user,
              notice(done) +
                  fill("<form method=\"get\" action=\"/admin\" class=\"search\" role=\"search\">\n"
                       "<input type=\"hidden\" name=\"view\" value=\"access\">\n"
                       "<label for=\"user\">User</label>\n"
                       "<input id=\"user\" name=\"user\" value=\"{}\" autocomplete=\"off\">\n"
                       "<button>Show</button>\n</form>\n",
                       {shown}) +
                  (shown.empty() ? "<h2 class=\"spaced\">Users</h2>\n" + userItems(all, names)
                                 : accessOfUser(user, shown, all, names)));
}

Answer logPage(const std::string& user, const std::string& filter, const std::string& number) {
  const int page = pageNumber(number);
  std::vector<LogEntry> entries = logEntries(filter, page);
  const bool more = entries.size() > kLogRows;
  if (more) entries.pop_back();
  std::string rows;
  for (const LogEntry& entry : entries) {
    rows += "<tr><td>" + timeText(entry.time) + fill("</td><td>{}</td></tr>\n", {entry.text});
  }
  return view(kLog, user,
              fill("<form method=\"get\" action=\"/admin\" class=\"search\" role=\"search\">\n"
                   "<input type=\"hidden\" name=\"view\" value=\"log\">\n"
                   "<label for=\"filter\">Contains</label>\n"
                   "<input id=\"filter\" name=\"filter\" value=\"{}\" autocomplete=\"off\" "
                   "aria-describedby=\"filter-hint\">\n"
                   "<button>Filter</button>\n</form>\n"
                   "<p class=\"hint\" id=\"filter-hint\">% stands for any text, _ for any "
                   "character.</p>\n",
                   {filter}) +
                  (rows.empty() ? "<p class=\"empty\">No entry.</p>\n"
                                : "<div class=\"card\"><table>\n<thead><tr><th "
                                  "scope=\"col\">Time</th><th scope=\"col\">Entry</th></tr></thead>"
                                  "\n<tbody>\n" +
                                      rows + "</tbody></table></div>\n") +
                  logTurns(filter, page, more));
}

Answer storagePage(const std::string& user) {
  std::string rows;
  for (const Fill& table : tableFill()) {
    const std::string limit = std::to_string(table.limit);
    const std::string count = std::to_string(table.rows);
    rows += fill(
        "<li class=\"card\"><h2>{}</h2>\n"
        "<p class=\"figure\"><strong>{}</strong> of {} rows</p>\n"
        "<meter min=\"0\" max=\"{}\" high=\"" +
            std::to_string(table.limit * 9 / 10) +
            "\" value=\"{}\" aria-label=\"{}\">{}</meter></li>\n",
        {table.what, count, limit, limit, count, table.what, count});
  }
  return view(kStorage, user,
              "<ul class=\"cards small\">\n" + rows +
                  "</ul>\n<p class=\"hint\">A full table refuses new rows with an invitation to "
                  "try again; the audit log drops its oldest entries instead.</p>\n");
}

Answer secretPage(const std::string& user, const std::string& name, const std::string& identifier,
                  const std::string& secret) {
  return view(kApplications, user,
              fill("<section class=\"card\" aria-labelledby=\"secret\">\n"
                   "<h2 id=\"secret\">{} is registered</h2>\n"
                   "<p class=\"notice\" role=\"status\">Copy the secret now: it is shown this once "
                   "and never again.</p>\n"
                   "<dl><dt>Identifier</dt><dd><code>{}</code></dd>\n"
                   "<dt>Secret</dt><dd><code class=\"secret\">{}</code></dd></dl>\n"
                   "<p><a class=\"button\" href=\"/admin\">Done</a></p>\n</section>\n",
                   {name, identifier, secret}));
}

}  // namespace service
