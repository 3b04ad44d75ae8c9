#include "examples/cgi/scopes.h"

#include <algorithm>

#include "examples/cgi/encoding.h"

namespace service {
namespace {

bool contains(const std::vector<std::string>& names, const std::string& name) {
  return std::find(names.begin(), names.end(), name) != names.end();
}

const Scope* findScope(const std::string& name) {
  const auto* found = std::find_if(kScopes.begin(), kScopes.end(),
                                   [&](const Scope& scope) { return scope.name == name; });
  return found == kScopes.end() ? nullptr : found;
}

}  // namespace

std::vector<std::string> scopeNames(const std::string& list) {
  std::vector<std::string> names;
  for (std::string& name : split(list, ' ')) {
    if (!name.empty() && !contains(names, name)) names.push_back(std::move(name));
  }
  return names;
}

std::string tidyScope(const std::string& list) {
  std::string tidy;
  for (const std::string& name : scopeNames(list)) tidy += (tidy.empty() ? "" : " ") + name;
  return tidy;
}

std::string knownScopes(const std::string& list) {
  std::string known;
  for (const std::string& name : scopeNames(list)) {
    if (findScope(name) != nullptr) known += (known.empty() ? "" : " ") + name;
  }
  return known;
}

bool isWithin(const std::string& asked, const std::string& granted) {
  const std::vector<std::string> allowed = scopeNames(granted);
  const std::vector<std::string> names = scopeNames(asked);
  return std::all_of(names.begin(), names.end(),
                     [&](const std::string& name) { return contains(allowed, name); });
}

std::string inWords(const std::string& scope) {
  const Scope* found = findScope(scope);
  return found == nullptr ? scope : found->words;
}

}  // namespace service
