#include "service/pages/account.h"

#include <algorithm>
#include <string_view>

#include "service/pages/form_token.h"
#include "service/pages/frame.h"
#include "service/pages/held.h"
#include "service/pages/html.h"
#include "service/pages/sign_in.h"
#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

using grants::AccessEntry;

// What a form takes back is one word: it names a login, an application, or all.

constexpr char kEverything[] = "all";
constexpr std::string_view kLoginStart = "login.";
constexpr std::string_view kApplicationStart = "application.";

constexpr std::size_t kMostLogins = 20;  // shown of one application

std::string wordOf(const grants::AccessHandle& handle) {
  const char* table = handle.table == grants::AccessHandle::Table::kCodes ? "code" : "token";
  return std::string(kLoginStart) + table + "." + std::to_string(handle.row) + "." + handle.mark;
}

std::string wordOf(const grants::ApplicationId& application) {
  return std::string(kApplicationStart) + application.text();
}

std::string subjectOf(const std::string& what) {
  return "account." + what;
}

std::vector<AccessEntry> entriesOf(Context& context, const Request& request) {
  grants::AccessFilter filter;
  filter.user = grants::User(request.user);
  return context.store.open().access.list(filter);
}

// The page ------------------------------------------------------------------------

std::string takeBackForm(const Settings& settings, const Request& request,
                         const std::string& what) {
  return fill(
      "<form method=\"post\" action=\"{}\">\n"
      "<input type=\"hidden\" name=\"form_token\" value=\"{}\">\n"
      "<input type=\"hidden\" name=\"what\" value=\"{}\">\n",
      {settings.link(kAccount.path), formToken(settings, request.user, subjectOf(what)), what});
}

std::string facts(const AccessEntry& entry) {
  const std::string& from = entry.from.text();
  return "<dl class=\"facts\">\n" + timeRow("Since", entry.since) +
         timeRow("Last used", lastUse(entry)) +
         (from.empty() ? "" : fill("<div><dt>From</dt><dd>{}</dd></div>\n", {from})) +
         timeRow(endTerm(entry), entry.ends) + "</dl>\n";
}

std::string loginItem(const Settings& settings, const Request& request, const AccessEntry& entry) {
  return "<li>\n" + badgeOf(stateOf(entry)) + facts(entry) +
         takeBackForm(settings, request, wordOf(entry.handle)) +
         fill(
             "<button aria-label=\"End this sign-in of {}\">End this sign-in</button>\n"
             "</form>\n</li>\n",
             {nameOf(entry)});
}

std::string logins(const Settings& settings, const Request& request, const Held& held) {
  if (held.entries.size() == 1) {
    return badgeOf(held.state) + facts(held.entries.front());
  }
  // Other programs bound nothing, and a page has to stay one.
  const std::size_t count = held.entries.size();
  std::string items;
  for (std::size_t i = count; i > 0 && i + kMostLogins > count; --i) {
    items += loginItem(settings, request, held.entries[i - 1]);
  }
  return badgeOf(held.state) +
         fill("<details class=\"logins\"><summary>{} sign-ins</summary>\n<ul>\n",
              {std::to_string(count)}) +
         items + "</ul>\n" +
         (count <= kMostLogins ? "" : "<p class=\"hint\">These are the newest of them.</p>\n") +
         "</details>\n";
}

std::string applicationItem(const Settings& settings, const Request& request, const Held& held) {
  return fill("<li class=\"card\">\n<h2><bdi>{}</bdi></h2>\n<p class=\"can\">It can</p>\n",
              {held.name}) +
         scopeWords(settings, held.scope) + logins(settings, request, held) +
         "<div class=\"actions\">\n" + takeBackForm(settings, request, wordOf(held.application)) +
         fill(
             "<button class=\"danger\" aria-label=\"Take back access: {}\">Take back "
             "access</button>\n"
             "</form>\n</div>\n</li>\n",
             {held.name});
}

std::string everythingForm(const Settings& settings, const Request& request) {
  return "<details class=\"end\"><summary>Take back everything…</summary>\n" +
         takeBackForm(settings, request, kEverything) +
         "<p>Every application has to ask you again.</p>\n"
         "<button class=\"danger\">Take back everything</button>\n</form>\n</details>\n";
}

Answer show(Context& context, const Request& request, const Parameters& query) {
  const Settings& settings = context.settings;
  const std::vector<Held> all = heldBy(entriesOf(context, request));
  const Turn turn{pageNumber(query.value("page")), static_cast<long long>(all.size()),
                  "applications", "/account?page="};
  const auto skipped = static_cast<std::size_t>(turn.page - 1) * kRowsOfPage;
  std::string items;
  for (std::size_t i = skipped; i < std::min(all.size(), skipped + kRowsOfPage); ++i) {
    items += applicationItem(settings, request, all[i]);
  }
  std::string content = notice(query.value("done"));
  if (all.empty()) {
    return view(kAccount, context, request,
                content + "<p class=\"empty\">No application has access in your name.</p>\n");
  }
  content += "<p>These applications act in your name. What you take back ends at once.</p>\n";
  return view(kAccount, context, request,
              content + "<ul class=\"cards\">\n" + items + "</ul>\n" + turns(settings, turn) +
                  "<p class=\"hint\">“Last used” is when it last renewed its access, and the "
                  "address is where it did that from. Unused until the last date, it has to ask "
                  "you again.</p>\n" +
                  everythingForm(settings, request));
}

// Taking back ---------------------------------------------------------------------

grants::Ended endOne(Context& context, const Request& request, const std::string& what) {
  for (const AccessEntry& entry : entriesOf(context, request)) {
    // The list is of this user alone, and so a handle of another's is not in it.
    if (wordOf(entry.handle) == what) {
      return context.store.open().access.end(entry.handle, grants::Actor(request.user));
    }
  }
  return {0, 0};
}

grants::Ended end(Context& context, const Request& request, const std::string& what) {
  const grants::User user(request.user);
  const grants::Actor by(request.user);
  if (what == kEverything) return context.store.open().access.endUser(user, by);
  if (what.rfind(kApplicationStart, 0) == 0) {
    const grants::ApplicationId application(what.substr(kApplicationStart.size()));
    return context.store.open().access.endUserWith(user, application, by);
  }
  return endOne(context, request, what);
}

Answer takeBack(Context& context, const Request& request, const Parameters& form) {
  const std::string what = form.value("what");
  if (form.isAnyDoubled({"form_token", "what"}) ||
      !isFormToken(context.settings, form.value("form_token"), request.user, subjectOf(what))) {
    return messagePage(context.settings, 403, "This form is too old",
                       "Or it does not come from this box. Nothing was changed; go back and "
                       "repeat what you did.",
                       kAccount.path);
  }
  const grants::Ended ended = end(context, request, what);
  const bool wasThere = ended.codes + ended.tokens > 0;
  return redirectAnswer(
      request, context.settings.link(wasThere ? "/account?done=ended" : "/account?done=gone"));
}

}  // namespace

Answer account(Context& context, const Request& request) {
  if (request.user.empty()) return signInFirst(context.settings, request);
  const bool isForm = request.method == "POST";
  if (!isForm && !request.isRead()) return methodNotAllowed("GET, HEAD, POST");
  if (isForm && !request.isForm()) {
    return messagePage(context.settings, 400, "This is not a form", "Nothing was changed.");
  }
  const std::optional<Parameters> given = Parameters::parse(isForm ? request.body : request.query);
  if (!given) {
    return messagePage(context.settings, 400, "The request cannot be read", "Nothing was changed.");
  }
  return isForm ? takeBack(context, request, *given) : show(context, request, *given);
}

}  // namespace keldoauth::service
