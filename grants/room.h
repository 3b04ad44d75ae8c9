// How full the store is, and clearing away what is dead.

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
