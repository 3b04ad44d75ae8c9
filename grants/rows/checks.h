// What the values of a request must be, before anything is looked up.

#ifndef KELDOAUTH_GRANTS_ROWS_CHECKS_H
#define KELDOAUTH_GRANTS_ROWS_CHECKS_H

#include <initializer_list>
#include <optional>
#include <string>
#include <string_view>

#include "grants/outcome.h"
#include "utils/oauth_bounds.h"

namespace KELDOAUTHSERVER::grants::rows {

bool hasNul(std::string_view text);
bool isWithin(std::string_view text, const Bounds& bounds);

/// The fault of the first text that has a NUL byte or is out of its bounds.
struct Bounded {
  const std::string& text;
  const Bounds& bounds;
};
std::optional<Why> faultOf(std::initializer_list<Bounded> texts);

/// An IPv4 or IPv6 address, with a scope of up to 15
/// letters, digits and "-._" perhaps.
bool isPeer(const std::string& text);

/// An absolute address in printable ASCII without a blank, and without what
/// stands in no address.
bool isAddress(std::string_view text);

/// 64 letters, digits and "-._~".
bool isIdentifier(std::string_view text);

/// Printable ASCII without a blank.
bool isVisible(std::string_view text);

/// Whether each blank-separated name of `scope`, which must have one, is in
/// `granted`.
bool isScopeWithin(std::string_view scope, std::string_view granted);

/// Of a code or token: at least a second, at most a hundred years.
bool isLifetime(const std::optional<long long>& seconds);

}  // namespace KELDOAUTHSERVER::grants::rows

#endif  // KELDOAUTH_GRANTS_ROWS_CHECKS_H
