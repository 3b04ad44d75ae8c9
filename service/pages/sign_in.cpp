#include "service/pages/sign_in.h"

#include <algorithm>
#include <string_view>

#include "service/http/cookies.h"
#include "service/pages/form_token.h"
#include "service/pages/html.h"
#include "service/people/people.h"
#include "service/people/sign_in.h"
#include "service/text/encoding.h"
#include "utils/oauth_utils.h"

namespace keldoauth::service {
namespace {

constexpr char kSignIn[] = "/oauth/sign-in";
constexpr char kSignOut[] = "/oauth/sign-out";
constexpr char kHome[] = "/account";

/// Ties the form to the browser it was shown in: before somebody has signed in
/// there is no user to tie it to, and another site could sign its visitor in as
/// somebody else.
constexpr std::string_view kFormCookie = "keldoauth-form";
constexpr unsigned int kFormCookieLength = 64;

constexpr char kHead[] = "<main class=\"card sign-in\">\n<h1>Sign in</h1>\n";

constexpr char kForm[] = R"(<form method="post" action="{}">
<input type="hidden" name="next" value="{}">
<input type="hidden" name="form_token" value="{}">
<p><label for="user">User name</label>
<input id="user" name="user" value="{}" autocomplete="username" autocapitalize="none"
spellcheck="false" maxlength="256" required{}></p>
<p><label for="password">Password</label>
<input id="password" name="password" type="password" autocomplete="current-password"
maxlength="511" required{}></p>
<div class="actions"><button class="primary">Sign in</button></div>
</form>
</main>
)";

bool isPathCharacter(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '-' ||
         c == '_' || c == '/';
}

bool isQueryCharacter(char c) {
  return c > ' ' && c <= '~' && c != '"' && c != '<' && c != '>' && c != '\\' && c != '#';
}

/// What follows the path of a page: deeper paths, and a query.
bool isHarmless(const std::string& rest) {
  const auto query = rest.begin() + std::ptrdiff_t(std::min(rest.find('?'), rest.size()));
  return (rest.empty() || rest[0] == '/' || rest[0] == '?') &&
         std::all_of(rest.begin(), query, isPathCharacter) &&
         std::all_of(query, rest.end(), isQueryCharacter);
}

std::string subjectOf(const std::string& next) {
  return "sign-in." + next;
}

std::string signOutSubject(const Request& request) {
  return "sign-out." + request.session;
}

/// The browser's value, or a new one.
std::string formCookie(const Request& request) {
  const std::optional<std::string> sent = cookieValue(request, kFormCookie);
  if (sent && sent->size() == kFormCookieLength) return *sent;
  return KELDOAUTHSERVER::getRandomStr(kFormCookieLength);
}

struct Shown {
  int status = 200;
  std::string message;
  std::string user;
};

/// Signed in, the user goes on to an application, maybe without another page:
/// hence a page that may lead away.
Answer form(const Settings& settings, const Request& request, const std::string& next,
            const Shown& shown) {
  const std::string cookie = formCookie(request);
  const std::string message =
      shown.message.empty() ? ""
                            : fill("<p class=\"notice\" role=\"alert\">{}</p>\n", {shown.message});
  const bool knowsUser = !shown.user.empty();
  return pageLeadingAway(
             settings, "Sign in",
             kHead + message +
                 fill(kForm,
                      {settings.link(kSignIn), next, formToken(settings, cookie, subjectOf(next)),
                       shown.user, knowsUser ? "" : " autofocus", knowsUser ? " autofocus" : ""}),
             shown.status)
      .with("Set-Cookie", cookieToSet(request, kFormCookie, cookie));
}

bool isFromHere(const Settings& settings, const Request& request, const Parameters& given) {
  const std::optional<std::string> cookie = cookieValue(request, kFormCookie);
  return cookie && cookie->size() == kFormCookieLength &&
         isFormToken(settings, given.value("form_token"), *cookie, subjectOf(given.value("next")));
}

std::string inWords(int seconds) {
  const int minutes = (seconds + 59) / 60;
  if (seconds < 60) return std::to_string(seconds) + " seconds";
  return minutes == 1 ? "a minute" : std::to_string(minutes) + " minutes";
}

Answer welcome(const Settings& settings, const Request& request, const Directory& directory,
               const std::string& user, const std::string& next) {
  const std::optional<std::string> session = sessionsOf(settings, directory).begin(user);
  if (!session) throw DirectoryTrouble("gone between two looks");
  const std::string browser = KnownBrowsers(settings.sessionKey).remember(user);
  return redirectAnswer(request, next.empty() ? settings.link(kHome) : next)
      .with("Set-Cookie", cookieToSet(request, kSessionCookie, *session))
      .with("Set-Cookie", cookieToSet(request, kBrowserCookie, browser, KnownBrowsers::kSeconds))
      .with("Set-Cookie", cookieToForget(request, kFormCookie));
}

Answer check(const Settings& settings, const Request& request, const Directory& directory,
             const Parameters& given) {
  const std::string user = given.value("user");
  const std::string next = safeNext(settings, given.value("next"));
  if (!isFromHere(settings, request, given)) {
    return form(settings, request, next,
                {403, "That form was too old, or not from this box. Please try again.", ""});
  }
  const std::string browser = cookieValue(request, kBrowserCookie).value_or("");
  Throttle throttle = throttleOf(settings);
  const SignInOutcome outcome = signIn(directory, throttle,
                                       {user, given.value("password"), request.peer,
                                        KnownBrowsers(settings.sessionKey).nameOf(browser, user)});
  switch (outcome.end) {
    case SignInEnd::kIn:
      return welcome(settings, request, directory, outcome.user, next);
    case SignInEnd::kWrong:
      return form(settings, request, next, {403, "Name or password is wrong.", user});
    case SignInEnd::kTooOften:
      return form(settings, request, next,
                  {429,
                   "Too many tries. Please wait " + inWords(outcome.waitSeconds) +
                       "; it helps nothing to try before.",
                   user})
          .with("Retry-After", std::to_string(outcome.waitSeconds));
    case SignInEnd::kCannotSay:
      break;
  }
  throw DirectoryTrouble("passwords cannot be checked");
}

Answer noSuchPage(const Settings& settings) {
  return messagePage(settings, 404, "There is no such page",
                     "On this box the web server asks for names and passwords.");
}

}  // namespace

std::string safeNext(const Settings& settings, const std::string& next) {
  for (const char* ours : {"/oauth/authorize", "/oauth/logout", "/account", "/admin"}) {
    const std::string start = settings.link(ours);
    if (next.substr(0, start.size()) == start && isHarmless(next.substr(start.size()))) return next;
  }
  return {};
}

std::string signInPath(const Settings& settings, const Request& request) {
  const std::string asked = request.path + (request.query.empty() ? "" : "?" + request.query);
  const std::string next = request.isRead() ? safeNext(settings, asked) : "";
  return settings.link(kSignIn) + (next.empty() ? "" : "?next=" + percentEncode(next));
}

Answer signInFirst(const Settings& settings, const Request& request) {
  if (settings.signIn == SignIn::kWebServer) {
    return messagePage(settings, 403, "This request cannot be answered",
                       "The web server does not say who you are.");
  }
  if (request.isRead()) return redirectAnswer(request, signInPath(settings, request));
  return messagePage(settings, 403, "You are not signed in any more",
                     "Nothing was changed. Sign in, and repeat what you did.", kSignIn);
}

std::string signOutForm(const Settings& settings, const Request& request) {
  if (request.session.empty()) return {};
  return fill(
      "<form method=\"post\" action=\"{}\">\n"
      "<input type=\"hidden\" name=\"form_token\" value=\"{}\">\n"
      "<button>Sign out</button>\n</form>\n",
      {settings.link(kSignOut), formToken(settings, request.user, signOutSubject(request))});
}

Answer signInPage(Context& context, const Request& request) {
  const Settings& settings = context.settings;
  const std::unique_ptr<Directory> directory = directoryOf(settings);
  if (!directory) return noSuchPage(settings);
  const bool isPost = request.method == "POST";
  if (!isPost && !request.isRead()) return methodNotAllowed("GET, HEAD, POST");
  const std::optional<Parameters> given = Parameters::parse(isPost ? request.body : request.query);
  if (!given || (isPost && !request.isForm()) ||
      given->isAnyDoubled({"user", "password", "next", "form_token"})) {
    return messagePage(settings, 400, "The request cannot be read", "Please sign in anew.",
                       kSignIn);
  }
  if (isPost) return check(settings, request, *directory, *given);
  const std::string message =
      cookieValue(request, kSessionCookie)
          ? (request.user.empty() ? "" : "You are signed in as " + request.user + ".")
          : "Your browser sends two sign-ins for this box. Remove its cookies for this address.";
  return form(settings, request, safeNext(settings, given->value("next")), {200, message, ""});
}

Answer signOutPage(Context& context, const Request& request) {
  const Settings& settings = context.settings;
  if (settings.signIn == SignIn::kWebServer) return noSuchPage(settings);
  const bool isPost = request.method == "POST";
  if (!isPost && !request.isRead()) return methodNotAllowed("GET, HEAD, POST");
  if (request.session.empty()) {
    return isPost ? redirectAnswer(request, settings.link(kSignOut))
                  : messagePage(settings, 200, "You are signed out",
                                "Nobody is signed in to this box with this browser.", kSignIn);
  }
  const std::optional<Parameters> given = Parameters::parse(isPost ? request.body : "");
  if (isPost && given && !given->isDoubled("form_token") &&
      isFormToken(settings, given->value("form_token"), request.user, signOutSubject(request))) {
    return redirectAnswer(request, settings.link(kSignOut))
        .with("Set-Cookie", cookieToForget(request, kSessionCookie));
  }
  return page(settings, isPost ? 403 : 200, "Sign out",
              fill("<main class=\"card message\">\n<h1>Sign out?</h1>\n"
                   "<p>You are signed in as <strong>{}</strong>. Applications that you let in "
                   "stay in.</p>\n",
                   {request.user}) +
                  signOutForm(settings, request) + "</main>\n");
}

}  // namespace keldoauth::service
