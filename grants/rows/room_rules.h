// Who may take how much of the tables, and what goes when there is no room.

#ifndef KELDOAUTH_GRANTS_ROWS_ROOM_RULES_H
#define KELDOAUTH_GRANTS_ROWS_ROOM_RULES_H

#include <optional>
#include <string>

#include "grants/rows/store.h"

namespace KELDOAUTHSERVER::grants::rows {

// Conditions of SQL. `grace` seconds ago the row was dead already.

/// A code is good before its expiry; one that is spent is remembered until its
/// login has to end, which is its expiry then.
std::string isDeadCode(long long now, long long grace = 0);
std::string isSpentCode();
/// No code at all, but among them.
std::string isPushedRequest();

/// An application's own token is good until its expiry, included; a login can
/// be refreshed for the policy's idle time after it.
std::string isDeadToken(const Policy& policy, long long now, long long grace = 0);

/// Of a login whose access token expired: its year is over, and nobody can
/// refresh it, though it is not dead by its expiry yet.
std::string isOverLogin(const Policy& policy, long long now);

/// Of an application that acts for itself.
std::string isOwnToken();

/// A column: how many of the selected rows meet the condition.
std::string countIf(const std::string& condition);

// Within the transaction of an operation that will insert a row: make the room
// that its owner is due. Throws Trouble (kFull), with one line in the system
// log, when there is none.

/// What of one's own goes beyond a bound.
enum class Evicts { kOldest, kNothing };

/// False when nothing that lives may go for the code, nor later for its login,
/// and something would have to: the codes of the same user and application that
/// wait to be redeemed count as logins then. Those that were redeemed do go.
bool makeRoomForCode(Store& store, const std::string& user, const std::string& application,
                     Evicts evicts, long long now);

/// The id that the row gets; none as above.
std::optional<long long> makeRoomForLogin(Store& store, const std::string& user,
                                          const std::string& application, Evicts evicts,
                                          long long now);

/// The id that the row gets.
/// The own tokens of all applications that registered themselves count as one
/// user's: anybody can register any number of them.
long long makeRoomForOwnToken(Store& store, const std::string& application, bool registeredItself,
                              long long now);

void makeRoomForPushed(Store& store, const std::string& application, long long now);

void makeRoomForApplication(Store& store, bool registersItself, long long now);

}  // namespace KELDOAUTHSERVER::grants::rows

#endif  // KELDOAUTH_GRANTS_ROWS_ROOM_RULES_H
