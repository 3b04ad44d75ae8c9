// Pages for people. Outside text gets into a page through `fill` alone, which
// escapes it.

#ifndef KELDOAUTH_SERVICE_PAGES_HTML_H
#define KELDOAUTH_SERVICE_PAGES_HTML_H

#include <initializer_list>
#include <string>
#include <string_view>

#include "service/http/answer.h"
#include "service/settings/settings.h"

namespace keldoauth::service {

/// For element content and for attributes in double quotes. Bytes that are no
/// UTF-8, and control characters, become U+FFFD.
std::string escape(std::string_view text);

/// `pattern` with each "{}" replaced by the next of `texts`, escaped.
std::string fill(std::string_view pattern, std::initializer_list<std::string_view> texts);

/// A page with this title and the markup `main`. Its policy allows our style
/// sheet and nothing else: no script, no frame, and forms to this server only.
Answer page(const Settings& settings, int status, const std::string& title,
            const std::string& main);

/// The same for a page whose form takes the user away to an application. The
/// browser would hold every redirect on that way against a list of targets, and
/// where the application sends the user next is its own affair.
Answer pageLeadingAway(const Settings& settings, const std::string& title, const std::string& main,
                       int status = 200);

/// A page that says one thing, with a link to `back`, a path
/// of ours, if there is a way back.
Answer messagePage(const Settings& settings, int status, const std::string& title,
                   const std::string& text, const std::string& back = "");

Answer failurePage(const Settings& settings, const Failure& failure);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PAGES_HTML_H
