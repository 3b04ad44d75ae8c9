#include "service/pages/consent_page.h"

#include "service/pages/form_token.h"
#include "service/pages/frame.h"
#include "service/pages/html.h"
#include "service/pages/sign_in.h"
#include "service/protocol/redirect.h"
#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

std::string hidden(const char* name, const std::string& value) {
  if (value.empty()) return {};
  return fill("<input type=\"hidden\" name=\"{}\" value=\"{}\">\n", {name, value});
}

/// The request once more, to come back with the decision.
std::string hiddenRequest(const Settings& settings, const std::string& user,
                          const AuthorizationRequest& asked) {
  const std::string start = hidden("client_id", asked.client.identifier.text()) +
                            hidden("form_token", formToken(settings, user, formSubject(asked)));
  if (asked.pushed) {
    return start + hidden("request_uri", std::string(kReferenceStart) + asked.pushed->text());
  }
  return start + hidden("redirect_uri", asked.redirectWasGiven ? asked.redirect : "") +
         hidden("response_type", "code") + hidden("scope", asked.scope) +
         hidden("state", asked.state) + hidden("nonce", asked.nonce) +
         hidden("code_challenge", asked.challenge) +
         hidden("code_challenge_method", asked.challenge.empty() ? "" : "S256");
}

/// How to become somebody else, and come back here.
std::string whoAsks(const Settings& settings, const Request& request) {
  const std::string change =
      settings.signIn == SignIn::kWebServer
          ? "Not you? Close all windows of the browser: it remembers the password.</p>\n"
          : fill("Not you? <a href=\"{}\">Sign in as somebody else</a></p>\n",
                 {signInPath(settings, request)});
  return fill("<p class=\"eyebrow\">Signed in as <strong><bdi>{}</bdi></strong>. ",
              {request.user}) +
         change;
}

constexpr char kPrivateUse[] = R"(<p class="fault">The answer goes to an app on your device, the one
that opens addresses with <strong class="address">{}</strong>. Another app can say that it is
<bdi>{}</bdi>: allow this only if you have started it yourself just now.</p>
)";

constexpr char kLoopback[] = R"(<p class="fault">The answer goes to a program on the device that you
are using, at <strong class="address">{}</strong>. Any program there can say that it is
<bdi>{}</bdi>: allow this only if you have started it yourself just now.</p>
)";

constexpr char kWeb[] = R"(<p>You will return to <strong class="address">{}</strong></p>
)";

constexpr char kOwnWord[] = R"(<p class="hint">It registered itself: its name is its own word, and
nobody on this box has looked at it. Go by the address.</p>
)";

std::string whereTo(const AuthorizationRequest& asked) {
  const std::string origin = originOf(asked.redirect);
  const std::string& name = asked.client.name.text();
  const bool isPublic = asked.client.kind == grants::ApplicationKind::kPublic;
  switch (formOf(asked.redirect)) {
    case AddressForm::kPrivateUse:
      return fill(kPrivateUse, {origin, name});
    case AddressForm::kLoopback:
      return fill(isPublic ? kLoopback : kWeb, {origin, name});
    default:
      return fill(kWeb, {origin}) + (asked.client.registeredItself ? kOwnWord : "");
  }
}

constexpr char kDecision[] = R"(<div class="actions">
<button class="primary" name="decision" value="allow">Allow</button>
<button name="decision" value="refuse">Refuse</button>
</div>
</form>
<p class="hint">Allow this only if you started it yourself and trust the application. You can take
the access back at any time: <a href="{}">My applications</a></p>
</main>
)";

}  // namespace

std::string formSubject(const AuthorizationRequest& asked) {
  std::string subject = "consent";
  for (const std::string& part :
       {asked.client.identifier.text(), asked.redirect,
        std::string(asked.redirectWasGiven ? "given" : "implied"), asked.scope, asked.state,
        asked.challenge, asked.nonce, asked.pushed ? asked.pushed->text() : std::string()}) {
    subject += "." + base64Url(part);
  }
  return subject;
}

Answer consentPage(const Settings& settings, const Request& request,
                   const AuthorizationRequest& asked) {
  const std::string& name = asked.client.name.text();
  return pageLeadingAway(
      settings, name + " asks for access",
      "<main class=\"card consent\">\n" + whoAsks(settings, request) +
          fill("<h1><bdi class=\"app\">{}</bdi> asks for access to your box</h1>\n", {name}) +
          whereTo(asked) + "<h2>It would be able to</h2>\n" + scopeWords(settings, asked.scope) +
          fill("<form method=\"post\" action=\"{}\">\n", {settings.link("/oauth/authorize")}) +
          hiddenRequest(settings, request.user, asked) +
          fill(kDecision, {settings.link(kAccount.path)}));
}

}  // namespace keldoauth::service
