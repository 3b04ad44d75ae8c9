// The views of the administrator's page.

#ifndef KELDOAUTH_SERVICE_PAGES_ADMIN_PAGES_H
#define KELDOAUTH_SERVICE_PAGES_ADMIN_PAGES_H

#include <string>

#include "service/context.h"
#include "service/pages/admin_draft.h"

namespace keldoauth::service {

/// Fifty of those that are registered, by their names.
Answer applicationsPage(Context& context, const Request& request, const Parameters& query);

/// A form for a new one. It carries a number that is drawn for it, from which the
/// identifier follows: sent a second time it finds what it registered before.
Answer registerPage(const Context& context, const Request& request, const Draft& draft,
                    const std::string& once = "");

/// The identifier that such a form's application gets.
grants::ApplicationId identifierFrom(const Settings& settings, const std::string& once);

/// All about one application: the card for pasting, the form to change it, and
/// what ends it. With a `draft` that form has its texts and its fault.
Answer applicationPage(Context& context, const Request& request, const Parameters& query,
                       const Draft* draft = nullptr);

/// The path of that page for an application whose secret has just been made: for
/// a quarter of an hour it shows it, to this administrator.
std::string pathWithSecret(const Settings& settings, const Request& request,
                           const grants::ApplicationId& identifier,
                           const std::optional<grants::Secret>& secret, const std::string& done);

/// Stands in the form that renews a secret for the one to be renewed, so that a
/// form that is sent twice renews it once.
std::string markOf(const Settings& settings, const grants::Secret& secret);

Answer accessPage(Context& context, const Request& request, const Parameters& query);
Answer logPage(Context& context, const Request& request, const Parameters& query);
Answer storagePage(Context& context, const Request& request);

/// /admin: applications, access, audit log and storage, for the administrators of
/// the box.
Answer admin(Context& context, const Request& request);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PAGES_ADMIN_PAGES_H
