#include "service/pages/consent_page.h"

#include "service/http/encoding.h"
#include "service/pages/form_token.h"
#include "service/pages/html.h"
#include "service/protocol/redirect.h"

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
         hidden("state", asked.state) + hidden("code_challenge", asked.challenge) +
         hidden("code_challenge_method", asked.challenge.empty() ? "" : "S256");
}

std::string scopeItems(const Settings& settings, const std::string& scope) {
  std::string items;
  for (const std::string& name : scopeNames(scope)) {
    items += fill("<li>{}</li>\n", {settings.scopes.inWords(name)});
  }
  return items;
}

constexpr char kQuestion[] = R"(<main class="card consent">
<p class="eyebrow">Signed in as <strong>{}</strong></p>
<h1><bdi class="app">{}</bdi> asks for access to your box</h1>
<p>You will return to <strong class="address">{}</strong></p>
<h2>It would be able to</h2>
<ul class="scopes">
)";

constexpr char kDecision[] = R"(<div class="actions">
<button class="primary" name="decision" value="allow">Allow</button>
<button name="decision" value="refuse">Refuse</button>
</div>
</form>
<p class="hint">Allow this only if you started it yourself and trust the application. The
administrator of the box can take the access back at any time.</p>
</main>
)";

}  // namespace

std::string formSubject(const AuthorizationRequest& asked) {
  std::string subject = "consent";
  for (const std::string& part :
       {asked.client.identifier.text(), asked.redirect, asked.scope, asked.state, asked.challenge,
        asked.pushed ? asked.pushed->text() : std::string()}) {
    subject += "." + base64Url(part);
  }
  return subject;
}

Answer consentPage(const Settings& settings, const std::string& user,
                   const AuthorizationRequest& asked) {
  const std::string origin = originOf(asked.redirect);
  return pageLeadingAway(settings, asked.client.name.text() + " asks for access",
                         fill(kQuestion, {user, asked.client.name.text(), origin}) +
                             scopeItems(settings, asked.scope) +
                             fill("</ul>\n<form method=\"post\" action=\"{}\">\n",
                                  {settings.link("/oauth/authorize")}) +
                             hiddenRequest(settings, user, asked) + kDecision);
}

}  // namespace keldoauth::service
