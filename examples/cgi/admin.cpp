// /admin: applications, access, audit log and storage, for the administrators
// of the box. The web server has authenticated the user.

#include "examples/cgi/admin_actions.h"
#include "examples/cgi/admin_pages.h"
#include "examples/cgi/admin_view.h"
#include "examples/cgi/answer.h"
#include "examples/cgi/csrf.h"
#include "examples/cgi/html.h"
#include "examples/cgi/settings.h"

namespace {

using namespace service;

Answer show(const grants::Grants& store, const Request& request, const Parameters& query) {
  const std::string view = query.value("view");
  const std::string done = query.value("done");
  if (view == "access") {
    return accessPage(store, request.user, done, {query.value("user"), query.value("application")});
  }
  if (view == "log") {
    return logPage(store, request.user, query.value("filter"), query.value("page"));
  }
  if (view == "storage") return storagePage(store, request.user);
  return applicationsPage(store, request.user, done, {});
}

bool isFromHere(const Request& request, const Parameters& form) {
  return !form.isDoubled("form_token") &&
         isFormToken(form.value("form_token"), request.user, kAdminSubject);
}

Answer handle(const Request& request) {
  // The web server should have kept others out; the settings have the last word.
  if (settings().administrators.count(request.user) == 0) {
    return messagePage(403, "Not for you", "This page is for the administrators of the box.");
  }
  const bool isForm = request.method == "POST";
  if (!isForm && !request.isRead()) return methodNotAllowed("GET, HEAD, POST");
  if (isForm && !request.isForm()) {
    return messagePage(400, "This is not a form", "Nothing was changed.");
  }
  const std::optional<Parameters> given = Parameters::parse(isForm ? request.body : request.query);
  if (!given) return messagePage(400, "The request cannot be read", "Nothing was changed.");
  if (isForm && !isFromHere(request, *given)) {
    return messagePage(403, "This form is too old",
                       "Or it does not come from this box. Nothing was changed; go back and "
                       "repeat what you did.",
                       "/admin");
  }
  grants::Grants store;
  return isForm ? act(store, request, *given) : show(store, request, *given);
}

}  // namespace

int main() {
  return serve(handle, failurePage);
}
