#include "service/pages/admin_pages.h"
#include "service/pages/frame.h"
#include "service/pages/held.h"
#include "service/pages/html.h"
#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

using grants::AccessEntry;

/// Whose access is shown: a user's, or an application's own.
struct Shown {
  std::string user;
  std::string application;
};

// All of it, by pages -------------------------------------------------------------

std::string holderCell(const Settings& settings, const AccessEntry& entry) {
  const std::string path = settings.link("/admin?view=access");
  if (entry.user) {
    return fill("<a href=\"{}&amp;user={}\"><bdi>{}</bdi></a>",
                {path, percentEncode(entry.user->text()), entry.user->text()});
  }
  return fill("<a href=\"{}&amp;application={}\">for itself</a>",
              {path, percentEncode(entry.application.text())});
}

std::string applicationCell(const Settings& settings, const AccessEntry& entry) {
  if (!entry.applicationName) return escape(nameOf(entry));
  return fill("<a href=\"{}{}\"><bdi>{}</bdi></a>",
              {settings.link("/admin?view=application&client="),
               percentEncode(entry.application.text()), nameOf(entry)});
}

std::string cell(const char* term, const std::string& markup) {
  return fill("<td data-term=\"{}\">", {term}) + markup + "</td>";
}

std::string whenCell(const char* term, long long time) {
  return cell(term, time == 0 ? "–" : timeText(time));
}

std::string endCell(const AccessEntry& entry) {
  const bool isLogin = entry.kind == AccessEntry::Kind::kLogin;
  return cell(endTerm(entry), (isLogin ? "" : "ends ") + timeText(entry.ends));
}

std::string entryRow(const Settings& settings, const AccessEntry& entry) {
  return "<tr>" + cell("User", holderCell(settings, entry)) +
         cell("Application", applicationCell(settings, entry)) +
         cell("State", badgeOf(stateOf(entry))) + whenCell("Last used", lastUse(entry)) +
         cell("From", escape(entry.from.text())) + endCell(entry) + "</tr>\n";
}

constexpr char kTableHead[] =
    "<div class=\"card\"><table class=\"list\">\n<thead><tr><th scope=\"col\">User</th>"
    "<th scope=\"col\">Application</th><th scope=\"col\">State</th><th scope=\"col\">Last used</th>"
    "<th scope=\"col\">From</th><th scope=\"col\">Can renew until</th></tr></thead>\n<tbody>\n";

/// Of everybody or, with an application, of those who have given it something.
std::string everybody(Context& context, const Parameters& query) {
  const Settings& settings = context.settings;
  const std::string with = query.value("with");
  const int page = pageNumber(query.value("page"));
  grants::AccessFilter filter;
  filter.contains = query.value("contains");
  if (!with.empty()) filter.application = grants::ApplicationId(with);
  const auto found =
      context.store.open().access.page(filter, {kRowsOfPage, (page - 1) * kRowsOfPage});
  std::string rows;
  for (const AccessEntry& entry : found.items) rows += entryRow(settings, entry);
  if (rows.empty() && page == 1) {
    return filter.contains.empty() && with.empty()
               ? "<p class=\"empty\">Nobody has given any access.</p>\n"
               : "<p class=\"empty\">No access fits.</p>\n";
  }
  return (rows.empty() ? "" : kTableHead + rows + "</tbody></table></div>\n") +
         turns(settings, {page, found.total, "grants of access",
                          "/admin?view=access&with=" + percentEncode(with) +
                              "&contains=" + percentEncode(filter.contains) + "&page="});
}

// What somebody has given ---------------------------------------------------------

/// A form that asks to revoke; without an application, everything of the user.
std::string revokeForm(const Context& context, const Request& request, const char* action,
                       const Shown& shown, const std::string& client) {
  return formStart(context, request, action) +
         fill(
             "<input type=\"hidden\" name=\"client\" value=\"{}\">\n"
             "<input type=\"hidden\" name=\"user\" value=\"{}\">\n",
             {client, shown.user});
}

std::string accessItem(const Context& context, const Request& request, const Shown& shown,
                       const Held& held) {
  const AccessEntry& last = held.entries.back();
  return fill("<li class=\"card\">\n<h3><bdi>{}</bdi></h3>\n", {held.name}) + badgeOf(held.state) +
         "<dl class=\"facts\">\n" + timeRow("Since", held.since) +
         timeRow("Last used", held.renewed) + timeRow(endTerm(last), held.ends) +
         fill("<div><dt>Sign-ins</dt><dd>{}</dd></div></dl>\n",
              {std::to_string(held.entries.size())}) +
         scopeTags(held.scope) + "<div class=\"actions\">\n" +
         revokeForm(context, request, "revoke", shown, held.application.text()) +
         fill(
             "<button class=\"danger\" aria-label=\"Revoke the access of {}\">Revoke</button>\n"
             "</form></div>\n</li>\n",
             {held.name});
}

std::string revokeEverything(const Context& context, const Request& request, const Shown& shown) {
  return "<details class=\"end\"><summary>Revoke everything…</summary>\n" +
         revokeForm(context, request, "revoke-all", shown, "") +
         fill(
             "<p>Every application will have to ask <bdi>{}</bdi> again.</p>\n"
             "<button class=\"danger\">Revoke everything</button>\n</form>\n</details>\n",
             {shown.user});
}

/// What an application has for itself is under the application, not under the
/// users of whom it has something, too.
std::vector<Held> heldFor(Context& context, const Shown& shown) {
  grants::AccessFilter filter;
  if (!shown.user.empty()) filter.user = grants::User(shown.user);
  if (shown.user.empty()) filter.application = grants::ApplicationId(shown.application);
  std::vector<AccessEntry> entries;
  for (AccessEntry& entry : context.store.open().access.list(filter)) {
    if (filter.user || entry.kind == AccessEntry::Kind::kOwn) entries.push_back(std::move(entry));
  }
  return heldBy(std::move(entries));
}

std::string accessOf(Context& context, const Request& request, const Shown& shown) {
  const std::string heading =
      fill("<p><a href=\"{}\">All access</a></p>\n", {context.settings.link(kAccess.path)}) +
      (shown.user.empty()
           ? "<h2 class=\"spaced\">Access for itself</h2>\n"
           : fill("<h2 class=\"spaced\">Access for <bdi>{}</bdi></h2>\n", {shown.user}));
  std::string items;
  for (const Held& held : heldFor(context, shown)) {
    items += accessItem(context, request, shown, held);
  }
  if (items.empty()) return heading + "<p class=\"empty\">No application has access.</p>\n";
  return heading + "<ul class=\"cards\">\n" + items + "</ul>\n" +
         (shown.user.empty() ? "" : revokeEverything(context, request, shown));
}

}  // namespace

Answer accessPage(Context& context, const Request& request, const Parameters& query) {
  const Shown shown{query.value("user"), query.value("application")};
  const bool isList = shown.user.empty() && shown.application.empty();
  return view(kAccess, context, request,
              notice(query.value("done")) +
                  searchForm(context.settings, "access", "Search", query.value("contains"),
                             "Part of a user’s or an application’s name.") +
                  (isList ? everybody(context, query) : accessOf(context, request, shown)));
}

}  // namespace keldoauth::service
