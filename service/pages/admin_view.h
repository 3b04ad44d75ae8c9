// What the administrator's pages share.

#ifndef KELDOAUTH_SERVICE_PAGES_ADMIN_VIEW_H
#define KELDOAUTH_SERVICE_PAGES_ADMIN_VIEW_H

#include <string>

#include "service/context.h"

namespace keldoauth::service {

struct View {
  const char* title;
  const char* path;
};

inline constexpr View kApplications{"Applications", "/admin"};
inline constexpr View kAccess{"Access", "/admin?view=access"};
inline constexpr View kLog{"Audit log", "/admin?view=log"};
inline constexpr View kStorage{"Storage", "/admin?view=storage"};

/// What the forms' tokens are bound to.
inline constexpr char kAdminSubject[] = "admin";

/// A page with the navigation around `content`, which is markup.
Answer view(const View& current, const Context& context, const Request& request,
            const std::string& content, int status = 200);

/// What was done just now, as markup; nothing for an unknown word.
std::string notice(const std::string& done);

std::string timeText(long long seconds);
std::string scopeTags(const std::string& scope);

/// A form that asks for this action of admin_actions.h; its end is the caller's.
std::string formStart(const Context& context, const Request& request, const char* action);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PAGES_ADMIN_VIEW_H
