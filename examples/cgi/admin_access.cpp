#include "examples/cgi/admin_pages.h"

#include <ctime>
#include <map>

#include "examples/cgi/admin_rows.h"
#include "examples/cgi/admin_view.h"
#include "examples/cgi/encoding.h"
#include "examples/cgi/html.h"

namespace service {
namespace {

std::map<std::string, std::string> clientNames() {
  std::map<std::string, std::string> names;
  for (const Client& client : allClients()) names[client.identifier] = client.name;
  return names;
}

std::string nameOf(const std::map<std::string, std::string>& names, const std::string& clientId) {
  const auto found = names.find(clientId);
  return found == names.end() ? "An application that was removed" : found->second;
}

/// Markup in the order in which people look for names.
using ByName = std::multimap<std::string, std::string>;

std::string joined(const ByName& items) {
  std::string all;
  for (const auto& [name, item] : items) all += item;
  return all;
}

std::string userItem(const std::string& user, int applications) {
  return fill(
      "<li><a href=\"/admin?view=access&amp;user={}\"><bdi>{}</bdi></a> "
      "<span class=\"count\">{}</span></li>\n",
      {percentEncode(user), user,
       std::to_string(applications) + (applications == 1 ? " application" : " applications")});
}

/// In its own flow an application stands where users stand.
std::string userItems(const std::vector<Access>& all,
                      const std::map<std::string, std::string>& names) {
  std::map<std::string, int> people;
  ByName byName;
  for (const Access& access : all) {
    if (access.user != access.clientId) {
      ++people[access.user];
    } else {
      const std::string name = nameOf(names, access.clientId);
      byName.emplace(name,
                     fill("<li><a href=\"/admin?view=access&amp;user={}\"><bdi>{}</bdi></a></li>\n",
                          {access.user, name}));
    }
  }
  std::string items;
  for (const auto& [name, count] : people) items += userItem(name, count);
  std::string users = items.empty() ? "<p class=\"empty\">Nobody has given any access.</p>\n"
                                    : "<ul class=\"users\">\n" + items + "</ul>\n";
  if (byName.empty()) return users;
  return users +
         "<h2 class=\"spaced\">Applications that act for themselves</h2>\n"
         "<ul class=\"users\">\n" +
         joined(byName) + "</ul>\n";
}

const char* badgeOf(Access::State state) {
  switch (state) {
    case Access::State::kAllowed:
      return "<p class=\"badge on\">Allowed, not signed in yet</p>\n";
    case Access::State::kRenewable:
      return "<p class=\"badge off\">Can be renewed</p>\n";
    default:
      return "<p class=\"badge on\">In use</p>\n";
  }
}

std::string accessItem(const std::string& user, const Access& access, const std::string& name) {
  const bool expired = access.expires < std::time(nullptr);
  return fill("<li class=\"card\">\n<h3>{}</h3>\n", {name}) + badgeOf(access.state) +
         fill("<dl><dt>{}</dt><dd>", {expired ? "Expired" : "Expires"}) + timeText(access.expires) +
         fill("</dd>\n<dt>Grants</dt><dd>{}</dd></dl>\n", {std::to_string(access.grants)}) +
         scopeTags(access.scope) + "<div class=\"actions\">\n" + formStart(user, "revoke") +
         fill(
             "<input type=\"hidden\" name=\"client\" value=\"{}\">\n"
             "<input type=\"hidden\" name=\"user\" value=\"{}\">\n"
             "<button class=\"danger\" aria-label=\"Revoke the access of {}\">Revoke</button>\n"
             "</form></div>\n</li>\n",
             {access.clientId, access.user, name});
}

std::string accessOfUser(const std::string& user, const std::string& shown,
                         const std::vector<Access>& all,
                         const std::map<std::string, std::string>& names) {
  ByName byName;
  for (const Access& access : all) {
    if (access.user != shown) continue;
    const std::string name = nameOf(names, access.clientId);
    byName.emplace(name, accessItem(user, access, name));
  }
  const std::string items = joined(byName);
  const std::string heading = fill("<h2 class=\"spaced\">Access for {}</h2>\n",
                                   {names.count(shown) > 0 ? nameOf(names, shown) : shown});
  if (items.empty()) return heading + "<p class=\"empty\">No application has access.</p>\n";
  return heading + "<ul class=\"cards\">\n" + items + "</ul>\n";
}

}  // namespace

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

}  // namespace service
