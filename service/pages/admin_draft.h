// What an administrator types of an application: read, checked, and shown again
// with its fault.

#ifndef KELDOAUTH_SERVICE_PAGES_ADMIN_DRAFT_H
#define KELDOAUTH_SERVICE_PAGES_ADMIN_DRAFT_H

#include <string>
#include <vector>

#include "service/context.h"
#include "service/protocol/redirect.h"

namespace keldoauth::service {

struct Draft {
  std::string name;
  grants::ApplicationKind kind = grants::ApplicationKind::kConfidential;
  std::string addresses;        // as they were typed: a white space between two
  std::string logoutAddresses;  // likewise
  std::string scope = "profile";
  bool needsPkce = true;
  std::string fault;
};

/// `offered` are the scopes that the form had.
Draft readDraft(const Parameters& form, const std::string& offered);
Draft draftOf(const grants::Application& application);

/// Empty when an application may have all of it. What it has already it may
/// keep: the rules were others once.
std::string faultOf(const Draft& draft, const Draft& before = {});

template <typename Address>
std::vector<Address> addressesIn(const std::string& typed);

std::vector<std::string> typedWords(const std::string& typed);

/// The scopes of the box, and those that the application has beside them.
std::string offeredScopes(const Settings& settings, const std::string& scope = "");

/// The fields of a form but for its start and its end, as markup. The kind is to
/// choose only before it is registered.
std::string draftFields(const Settings& settings, const Draft& draft, bool isNew);

template <typename Address>
std::vector<Address> addressesIn(const std::string& typed) {
  std::vector<Address> addresses;
  for (const std::string& word : typedWords(typed)) addresses.emplace_back(word);
  return addresses;
}

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PAGES_ADMIN_DRAFT_H
