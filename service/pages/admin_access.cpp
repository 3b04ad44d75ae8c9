#include "service/pages/admin_pages.h"

#include <algorithm>
#include <ctime>
#include <map>

#include "service/http/encoding.h"
#include "service/pages/admin_view.h"
#include "service/pages/html.h"
#include "service/settings/scopes.h"

namespace keldoauth::service {
namespace {

using grants::AccessEntry;

/// What an application may do for a user, or for itself, by all of the entries
/// together: codes that can be redeemed, tokens that work or can be renewed.
struct Held {
  enum class State { kAllowed, kRenewable, kInUse };  // the best of them counts
  State state = State::kAllowed;
  std::string scope;
  long long since = 0;    // of the first; 0 when not known
  long long renewed = 0;  // of the last; likewise
  long long ends = 0;     // of the last
  int entries = 0;
};

/// By what people look for: the application's name, and then its identifier.
using Holder = std::pair<std::string, grants::ApplicationId>;
using HeldBy = std::map<Holder, Held>;

std::string nameOf(const AccessEntry& entry) {
  return entry.applicationName ? entry.applicationName->text() : "An application that was removed";
}

Held::State stateOf(const AccessEntry& entry) {
  if (entry.kind == AccessEntry::Kind::kCode) return Held::State::kAllowed;
  return entry.expires < std::time(nullptr) ? Held::State::kRenewable : Held::State::kInUse;
}

long long earlier(long long a, long long b) {
  return a == 0 || b == 0 ? std::max(a, b) : std::min(a, b);
}

void add(HeldBy& all, const AccessEntry& entry) {
  Held& held = all[{nameOf(entry), entry.application}];
  held.state = std::max(held.state, stateOf(entry));
  held.scope = tidyScope(held.scope + " " + entry.scope.text());
  held.since = earlier(held.since, entry.since);
  held.renewed = std::max(held.renewed, entry.renewed);
  held.ends = std::max(held.ends, entry.ends);
  ++held.entries;
}

// Who has given access ----------------------------------------------------------

std::string userItem(const Settings& settings, const std::string& user, std::size_t applications) {
  return fill(
      "<li><a href=\"{}?view=access&amp;user={}\"><bdi>{}</bdi></a> "
      "<span class=\"count\">{}</span></li>\n",
      {settings.link("/admin"), percentEncode(user), user,
       std::to_string(applications) + (applications == 1 ? " application" : " applications")});
}

std::string ownItems(const Settings& settings, const HeldBy& own) {
  if (own.empty()) return {};
  std::string items;
  for (const auto& [holder, held] : own) {
    items += fill("<li><a href=\"{}?view=access&amp;application={}\"><bdi>{}</bdi></a></li>\n",
                  {settings.link("/admin"), percentEncode(holder.second.text()), holder.first});
  }
  return "<h2 class=\"spaced\">Applications that act for themselves</h2>\n"
         "<ul class=\"users\">\n" +
         items + "</ul>\n";
}

std::string everybody(Context& context) {
  std::map<std::string, HeldBy> people;
  HeldBy own;
  for (const AccessEntry& entry : context.store.open().access.list({})) {
    add(entry.user ? people[entry.user->text()] : own, entry);
  }
  std::string items;
  for (const auto& [name, held] : people) items += userItem(context.settings, name, held.size());
  return "<h2 class=\"spaced\">Users</h2>\n" +
         (items.empty() ? "<p class=\"empty\">Nobody has given any access.</p>\n"
                        : "<ul class=\"users\">\n" + items + "</ul>\n") +
         ownItems(context.settings, own);
}

// What somebody has given -------------------------------------------------------

const char* badgeOf(Held::State state) {
  switch (state) {
    case Held::State::kAllowed:
      return "<p class=\"badge on\">Allowed, not signed in yet</p>\n";
    case Held::State::kRenewable:
      return "<p class=\"badge off\">Can be renewed</p>\n";
    default:
      return "<p class=\"badge on\">In use</p>\n";
  }
}

std::string timeRow(const char* what, long long time) {
  if (time == 0) return {};
  return fill("<dt>{}</dt><dd>", {what}) + timeText(time) + "</dd>\n";
}

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
                       const Holder& holder, const Held& held) {
  const auto& [name, client] = holder;
  return fill("<li class=\"card\">\n<h3>{}</h3>\n", {name}) + badgeOf(held.state) + "<dl>" +
         timeRow("Since", held.since) +
         timeRow("Renewed", held.renewed > held.since ? held.renewed : 0) +
         timeRow(shown.user.empty() ? "Ends" : "Ends if unused", held.ends) +
         fill("<dt>Grants</dt><dd>{}</dd></dl>\n", {std::to_string(held.entries)}) +
         scopeTags(held.scope) + "<div class=\"actions\">\n" +
         revokeForm(context, request, "revoke", shown, client.text()) +
         fill(
             "<button class=\"danger\" aria-label=\"Revoke the access of {}\">Revoke</button>\n"
             "</form></div>\n</li>\n",
             {name});
}

std::string revokeEverything(const Context& context, const Request& request, const Shown& shown) {
  return "<div class=\"actions\">\n<details><summary>Revoke everything…</summary>\n" +
         revokeForm(context, request, "revoke-all", shown, "") +
         fill(
             "<p>Every application will have to ask <bdi>{}</bdi> again.</p>\n"
             "<button class=\"danger\">Revoke everything</button>\n</form>\n</details>\n</div>\n",
             {shown.user});
}

/// What an application has for itself is under the application, not under the
/// users of whom it has something, too.
HeldBy heldFor(Context& context, const Shown& shown) {
  grants::AccessFilter filter;
  if (!shown.user.empty()) filter.user = grants::User(shown.user);
  if (shown.user.empty()) filter.application = grants::ApplicationId(shown.application);
  HeldBy all;
  for (const AccessEntry& entry : context.store.open().access.list(filter)) {
    if (filter.user || entry.kind == AccessEntry::Kind::kOwn) add(all, entry);
  }
  return all;
}

std::string accessOf(Context& context, const Request& request, const Shown& shown) {
  const HeldBy all = heldFor(context, shown);
  std::string items;
  for (const auto& [holder, held] : all) items += accessItem(context, request, shown, holder, held);
  const std::string heading = shown.user.empty()
                                  ? "<h2 class=\"spaced\">Access for itself</h2>\n"
                                  : fill("<h2 class=\"spaced\">Access for {}</h2>\n", {shown.user});
  if (items.empty()) return heading + "<p class=\"empty\">No application has access.</p>\n";
  return heading + "<ul class=\"cards\">\n" + items + "</ul>\n" +
         (shown.user.empty() ? "" : revokeEverything(context, request, shown));
}

}  // namespace

Answer accessPage(Context& context, const Request& request, const std::string& done,
                  const Shown& shown) {
  const bool isNobody = shown.user.empty() && shown.application.empty();
  return view(kAccess, context, request,
              notice(done) +
                  fill("<form method=\"get\" action=\"{}\" class=\"search\" role=\"search\">\n"
                       "<input type=\"hidden\" name=\"view\" value=\"access\">\n"
                       "<label for=\"user\">User</label>\n"
                       "<input id=\"user\" name=\"user\" value=\"{}\" autocomplete=\"off\">\n"
                       "<button>Show</button>\n</form>\n",
                       {context.settings.link("/admin"), shown.user}) +
                  (isNobody ? everybody(context) : accessOf(context, request, shown)));
}

}  // namespace keldoauth::service
