// What applications hold for a user, put together for people: an application may
// have a login on each of its user's devices.

#ifndef KELDOAUTH_SERVICE_PAGES_HELD_H
#define KELDOAUTH_SERVICE_PAGES_HELD_H

#include <string>
#include <vector>

#include "service/context.h"

namespace keldoauth::service {

namespace grants = KELDOAUTHSERVER::grants;

enum class HeldState { kAllowed, kRenewable, kInUse };

/// Codes that can be redeemed, tokens that work or can be renewed. Each time is 0
/// when it is not known.
struct Held {
  std::string name;
  grants::ApplicationId application;
  HeldState state = HeldState::kAllowed;  // the best of them counts
  std::string scope;                      // of all of them
  long long since = 0;                    // of the first
  long long renewed = 0;                  // of the last
  long long ends = 0;                     // of the last
  std::vector<grants::AccessEntry> entries;
};

/// One for each application, by what people look for: its name.
std::vector<Held> heldBy(std::vector<grants::AccessEntry> entries);

std::string nameOf(const grants::AccessEntry& entry);
/// As near as the store comes to it: when it was renewed; 0 for what was not used.
long long lastUse(const grants::AccessEntry& entry);
HeldState stateOf(const grants::AccessEntry& entry);

/// As markup.
std::string badgeOf(HeldState state);

/// "Ends" for what nothing renews, "Can renew until" for a login.
const char* endTerm(const grants::AccessEntry& entry);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PAGES_HELD_H
