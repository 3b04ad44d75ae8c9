#include <algorithm>

#include "grants/grants.h"
#include "service/http/cookies.h"
#include "service/oidc/endpoints.h"
#include "service/oidc/id_token.h"
#include "service/pages/form_token.h"
#include "service/pages/html.h"
#include "service/pages/sign_in.h"
#include "service/people/people.h"
#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

constexpr char kPath[] = "/oauth/logout";

[[noreturn]] void refuse(const Settings& settings, const std::string& why) {
  throw Refusal{messagePage(settings, 400, "This request cannot be answered", why)};
}

struct Asked {
  std::string client;
  std::string redirect;  // empty: to a page of ours
  std::string state;
  bool isSure = false;  // the hint is about the user who is signed in
};

bool isRegistered(Context& context, const Asked& asked) {
  const auto client = context.store.open().applications.find(grants::ApplicationId(asked.client));
  return client && client->isEnabled &&
         std::any_of(client->logoutAddresses.begin(), client->logoutAddresses.end(),
                     [&](const auto& address) { return address.text() == asked.redirect; });
}

Asked read(Context& context, const Request& request, const Parameters& given) {
  const Settings& settings = context.settings;
  if (given.isAnyDoubled({kHint, "client_id", "post_logout_redirect_uri", "state", "form_token"})) {
    refuse(settings, "A parameter occurs more than once.");
  }
  const Hint hint = readHint(settings, given.value(kHint));
  if (!hint.client.empty() && given.has("client_id") && given.value("client_id") != hint.client) {
    refuse(settings, "The application shows the token of another one.");
  }
  Asked asked{given.has("client_id") ? given.value("client_id") : hint.client,
              given.value("post_logout_redirect_uri"), given.value("state")};
  if (!asked.redirect.empty() && !isRegistered(context, asked)) {
    refuse(settings, "The address to return to is not one that the application registered.");
  }
  asked.isSure = !request.user.empty() && hint.subject == openIdSubject(grants::User(request.user));
  return asked;
}

Answer leave(const Settings& settings, const Request& request, const Asked& asked) {
  if (asked.redirect.empty()) {
    return messagePage(settings, 200, "You are signed out",
                       "Nobody is signed in to this box with this browser.");
  }
  std::string address = asked.redirect;
  if (!asked.state.empty()) {
    address += address.find('?') == std::string::npos ? '?' : '&';
    address += "state=" + percentEncode(asked.state);
  }
  return redirectAnswer(request, address);
}

std::string formSubject(const Request& request, const Asked& asked) {
  std::string subject = "logout." + request.session;
  for (const std::string& part : {asked.client, asked.redirect, asked.state}) {
    subject += "." + base64Url(part);
  }
  return subject;
}

std::string hidden(const char* name, const std::string& value) {
  if (value.empty()) return {};
  return fill("<input type=\"hidden\" name=\"{}\" value=\"{}\">\n", {name, value});
}

Answer ask(const Settings& settings, const Request& request, const Asked& asked) {
  return pageLeadingAway(
      settings, "Sign out",
      fill(
          "<main class=\"card message\">\n<h1>Sign out?</h1>\n"
          "<p>You are signed in as <strong>{}</strong>. Applications that you let in stay in.</p>\n"
          "<form method=\"post\" action=\"{}\">\n",
          {request.user, settings.link(kPath)}) +
          hidden("client_id", asked.client) + hidden("post_logout_redirect_uri", asked.redirect) +
          hidden("state", asked.state) +
          hidden("form_token", formToken(settings, request.user, formSubject(request, asked))) +
          "<div class=\"actions\"><button class=\"primary\">Sign out</button></div>\n"
          "</form>\n</main>\n");
}

/// The form of another site comes without the cookie that says who the user is
/// (SameSite). As a link it has it.
Answer asLink(const Settings& settings, const Request& request) {
  const std::string link = safeNext(settings, settings.link(kPath) + "?" + request.body);
  if (link.empty()) refuse(settings, "The request cannot be read.");
  return redirectAnswer(request, link);
}

Answer signOut(const Settings& settings, const Request& request, const Asked& asked) {
  return leave(settings, request, asked)
      .with("Set-Cookie", cookieToForget(request, kSessionCookie));
}

}  // namespace

Answer logout(Context& context, const Request& request) {
  const Settings& settings = context.settings;
  if (!offersOpenId(settings)) return plainAnswer(404);
  const bool isPost = request.method == "POST";
  if (!isPost && !request.isRead()) return methodNotAllowed("GET, HEAD, POST");
  const std::optional<Parameters> given = Parameters::parse(isPost ? request.body : request.query);
  if (!given || (isPost && !request.isForm())) refuse(settings, "The request cannot be read.");
  const bool isDecision = isPost && given->has("form_token");
  if (isPost && !isDecision) return asLink(settings, request);

  const Asked asked = read(context, request, *given);
  // Nobody to sign out; the browser's own login with the web server is not ours.
  if (request.session.empty()) return leave(settings, request, asked);
  if (asked.isSure || (isDecision && isFormToken(settings, given->value("form_token"), request.user,
                                                 formSubject(request, asked)))) {
    return signOut(settings, request, asked);
  }
  return ask(settings, request, asked);
}

}  // namespace keldoauth::service
