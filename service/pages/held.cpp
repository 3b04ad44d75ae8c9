#include "service/pages/held.h"

#include <algorithm>
#include <ctime>
#include <map>
#include <utility>

#include "service/settings/scopes.h"

namespace keldoauth::service {
namespace {

using grants::AccessEntry;

long long earlier(long long a, long long b) {
  return a == 0 || b == 0 ? std::max(a, b) : std::min(a, b);
}

void add(Held& held, AccessEntry&& entry) {
  held.state = std::max(held.state, stateOf(entry));
  held.scope = tidyScope(held.scope + " " + entry.scope.text());
  held.since = earlier(held.since, entry.since);
  held.renewed = std::max(held.renewed, lastUse(entry));
  held.ends = std::max(held.ends, entry.ends);
  held.entries.push_back(std::move(entry));
}

}  // namespace

std::vector<Held> heldBy(std::vector<AccessEntry> entries) {
  std::map<std::pair<std::string, grants::ApplicationId>, Held> byName;
  for (AccessEntry& entry : entries) {
    add(byName[{nameOf(entry), entry.application}], std::move(entry));
  }
  std::vector<Held> all;
  for (auto& [holder, held] : byName) {
    held.name = holder.first;
    held.application = holder.second;
    all.push_back(std::move(held));
  }
  return all;
}

std::string nameOf(const AccessEntry& entry) {
  return entry.applicationName ? entry.applicationName->text() : "An application that was removed";
}

long long lastUse(const AccessEntry& entry) {
  return entry.kind == AccessEntry::Kind::kCode ? 0 : entry.renewed;
}

HeldState stateOf(const AccessEntry& entry) {
  if (entry.kind == AccessEntry::Kind::kCode) return HeldState::kAllowed;
  return entry.expires < std::time(nullptr) ? HeldState::kRenewable : HeldState::kInUse;
}

std::string badgeOf(HeldState state) {
  switch (state) {
    case HeldState::kAllowed:
      return "<span class=\"badge on\">Allowed, not signed in yet</span>\n";
    case HeldState::kRenewable:
      return "<span class=\"badge off\">Idle, can renew</span>\n";
    default:
      return "<span class=\"badge on\">In use</span>\n";
  }
}

const char* endTerm(const AccessEntry& entry) {
  return entry.kind == AccessEntry::Kind::kLogin ? "Can renew until" : "Ends";
}

}  // namespace keldoauth::service
