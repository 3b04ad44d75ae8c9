// How full the store is, and clearing away what is dead:
//
//   a code     from its expiry on; one that was redeemed is remembered until the
//              login that came from it has to end, which is its expiry then
//   a pushed request from its expiry on; it counts as a code
//   a login    when nobody has refreshed it for the policy's idle time after its
//              access token expired
//   own token  after its expiry
//
// Rows of other programs die as logins do. The stores' own Purge goes by the
// expiry alone and ends logins that could still be refreshed.

#ifndef KELDOAUTH_GRANTS_ROOM_H
#define KELDOAUTH_GRANTS_ROOM_H

#include "grants/access.h"

namespace KELDOAUTHSERVER::grants {

class Store;

struct TableRoom {
  long long rows;
  long long most;  // what the settings allow
  long long dead;  // would go with a purge
};

struct RoomCount {
  TableRoom applications;  // none is ever dead
  TableRoom codes;
  long long spentCodes;  // not dead, but they give way when a code needs room
  long long pushed;      // requests that wait among the codes
  TableRoom tokens;
  TableRoom log;  // drops its oldest entries by itself
};

struct Purged {
  long long codes;
  long long tokens;
};

/// Each throws Trouble.
class Room {
 public:
  explicit Room(Store& store) : store_(store) {}

  /// All of it at one moment.
  [[nodiscard]] RoomCount count() const;

  /// What `purge` would remove.
  [[nodiscard]] Purged purgeable(long long grace = 0, Rows rows = Rows::kAll) const;

  /// Removes what has been dead for `grace` seconds (0 if below): codes that
  /// expired, logins that nobody can refresh any more, own tokens that expired.
  /// One transaction, one statement a table, and no audit entry.
  Purged purge(long long grace = 0, Rows rows = Rows::kAll);

 private:
  Store& store_;
};

}  // namespace KELDOAUTHSERVER::grants

#endif  // KELDOAUTH_GRANTS_ROOM_H
