#include "service/settings/scopes.h"

#include <algorithm>
#include <utility>

#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

bool contains(const std::vector<std::string>& names, const std::string& name) {
  return std::find(names.begin(), names.end(), name) != names.end();
}

}  // namespace

ScopeTable::ScopeTable(std::vector<KnownScope> scopes) : scopes_(std::move(scopes)) {}

const KnownScope* ScopeTable::find(const std::string& name) const {
  const auto found = std::find_if(scopes_.begin(), scopes_.end(),
                                  [&](const KnownScope& scope) { return scope.name == name; });
  return found == scopes_.end() ? nullptr : &*found;
}

std::string ScopeTable::known(const std::string& list) const {
  std::string known;
  for (const std::string& name : scopeNames(list)) {
    if (find(name) != nullptr) known += (known.empty() ? "" : " ") + name;
  }
  return known;
}

std::string ScopeTable::inWords(const std::string& scope) const {
  const KnownScope* found = find(scope);
  return found == nullptr ? scope : found->words;
}

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

bool isWithin(const std::string& asked, const std::string& granted) {
  const std::vector<std::string> allowed = scopeNames(granted);
  const std::vector<std::string> names = scopeNames(asked);
  return std::all_of(names.begin(), names.end(),
                     [&](const std::string& name) { return contains(allowed, name); });
}

}  // namespace keldoauth::service
