#include "service/pages/admin_actions.h"
#include "service/pages/admin_pages.h"
#include "service/pages/form_token.h"
#include "service/pages/frame.h"
#include "service/pages/html.h"
#include "service/pages/sign_in.h"

namespace keldoauth::service {
namespace {

Answer show(Context& context, const Request& request, const Parameters& query) {
  const std::string view = query.value("view");
  if (view == "access") return accessPage(context, request, query);
  if (view == "application") return applicationPage(context, request, query);
  if (view == "log") return logPage(context, request, query);
  if (view == "register") return registerPage(context, request, {});
  if (view == "storage") return storagePage(context, request);
  return applicationsPage(context, request, query);
}

bool isFromHere(const Settings& settings, const Request& request, const Parameters& form) {
  return !form.isDoubled("form_token") &&
         isFormToken(settings, form.value("form_token"), request.user, kAdminSubject);
}

}  // namespace

Answer admin(Context& context, const Request& request) {
  if (request.user.empty()) return signInFirst(context.settings, request);
  if (!isAdministrator(context.settings, request)) {
    return messagePage(context.settings, 403, "Not for you",
                       "This page is for the administrators of the box.", kAccount.path);
  }
  const bool isForm = request.method == "POST";
  if (!isForm && !request.isRead()) return methodNotAllowed("GET, HEAD, POST");
  if (isForm && !request.isForm()) {
    return messagePage(context.settings, 400, "This is not a form", "Nothing was changed.");
  }
  const std::optional<Parameters> given = Parameters::parse(isForm ? request.body : request.query);
  if (!given) {
    return messagePage(context.settings, 400, "The request cannot be read", "Nothing was changed.");
  }
  if (isForm && !isFromHere(context.settings, request, *given)) {
    return messagePage(context.settings, 403, "This form is too old",
                       "Or it does not come from this box. Nothing was changed; go back and "
                       "repeat what you did.",
                       "/admin");
  }
  return isForm ? act(context, request, *given) : show(context, request, *given);
}

}  // namespace keldoauth::service
