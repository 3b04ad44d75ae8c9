// The frame around the pages that a user of the box comes to on their own, and
// what these pages share.

#ifndef KELDOAUTH_SERVICE_PAGES_FRAME_H
#define KELDOAUTH_SERVICE_PAGES_FRAME_H

#include <string>

#include "service/context.h"

namespace keldoauth::service {

struct View {
  const char* title;
  const char* path;
};

inline constexpr View kAccount{"My applications", "/account"};

// For administrators alone.
inline constexpr View kApplications{"Applications", "/admin"};
inline constexpr View kAccess{"Access", "/admin?view=access"};
inline constexpr View kLog{"Audit log", "/admin?view=log"};
inline constexpr View kStorage{"Storage", "/admin?view=storage"};

bool isAdministrator(const Settings& settings, const Request& request);

/// A page with the navigation and `heading` around `content`, which is markup.
Answer framed(const View& current, const Settings& settings, const Request& request,
              const std::string& heading, const std::string& content, int status = 200);

/// The same under the title of the view.
Answer view(const View& current, const Context& context, const Request& request,
            const std::string& content, int status = 200);

// Parts, as markup ----------------------------------------------------------------

/// What was done just now; nothing for an unknown word.
std::string notice(const std::string& done);

/// "Signed in as ...", and how to become somebody else: a form, or where the web
/// server asks for passwords the words for it.
std::string whoLine(const Settings& settings, const Request& request);

std::string timeText(long long seconds);
/// A term and a time of a list; nothing for 0, a time that is not known.
std::string timeRow(const char* term, long long seconds);
std::string scopeTags(const std::string& scope);
/// What the scopes allow, in the words of the settings.
std::string scopeWords(const Settings& settings, const std::string& scope);

/// Where a page of a long list stands in it.
struct Turn {
  int page;               // 1 is the first
  long long total;        // of the whole list
  const char* what;       // "applications"
  std::string addressOf;  // of such a page, up to its number
};

inline constexpr int kRowsOfPage = 50;

/// Any text will do: no list is so long that it had more pages.
int pageNumber(const std::string& text);
/// "51 to 100 of 312 applications", and the ways to the others; nothing when all
/// are on the page.
std::string turns(const Settings& settings, const Turn& turn);

/// A search form for such a list. `view` is the word in the query, empty for the
/// first.
std::string searchForm(const Settings& settings, const char* view, const char* label,
                       const std::string& contains, const char* hint);

/// A form that asks for this action of admin_actions.h; its end is the caller's.
std::string formStart(const Context& context, const Request& request, const char* action);

/// What the administrator's forms' tokens are bound to.
inline constexpr char kAdminSubject[] = "admin";

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PAGES_FRAME_H
