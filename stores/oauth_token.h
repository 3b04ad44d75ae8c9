// The tokens: one row per issued pair of access and refresh token in
// names::kTokenTable. The expiry is the access token's; a refresh token lives
// as long as its row, so a purge right after the expiry ends it, too.
//
// To refresh exactly once, delete the row *by its refresh token* (DBDel with the
// condition {"refresh_token": ...}), go on only when that succeeds, and issue
// the new pair. An id will not do: SQLite gives the highest one out again.
//
// Rows come back as DBGet delivers them: an array of objects with "id",
// "username", "client_id", "scope", "refresh_token", "access_token",
// "expired_time", "flow_type", "state" and "ip", every value a text.

#ifndef KELDOAUTH_STORES_OAUTH_TOKEN_H
#define KELDOAUTH_STORES_OAUTH_TOKEN_H

#include <string>

#include "core/oauth_db_basic.h"

namespace KELDOAUTHSERVER {

class OAUTHDBToken : public OAUTHDBBasic {
 public:
  /// `tableName` is names::kTokenTable.
  explicit OAUTHDBToken(const std::string& tableName);

  /// On the connection of `store`, which must outlive this object: nothing is
  /// opened, created or closed, and a transaction that is begun through one
  /// holds for both. Ready when `store` is, at this moment; the error state is
  /// this object's own.
  OAUTHDBToken(const std::string& tableName, OAUTHDBBasic& store);

  // Issuing -----------------------------------------------------------------

  /// Issues a pair of generated tokens that expires names::kTokenExpired
  /// seconds from now, and stores it as the form below does.
  int Add(const std::string& username, const std::string& client_id, const std::string& scope,
          const std::string& flow_type, const std::string& state, const std::string& ip,
          Json::Value& result);

  /// Stores a pair. Lengths in bytes:
  ///   username       1 to 256
  ///   client_id      64
  ///   scope          1 to 2048
  ///   refresh_token  64
  ///   access_token   64, not yet stored
  ///   expired_time   1 to 128; Unix seconds as decimal text
  ///   flow_type      1 to 32
  ///   state          1 to 2048
  ///   ip             an IPv4 or IPv6 address, or empty
  /// `result` receives "refresh_token" and "access_token" as soon as the
  /// arguments are accepted, so also when the insert then fails; nothing before
  /// that. Single quotes in the values are stored doubled.
  /// False: -5 "Token Table is full" when names::kTokenMax rows are there,
  /// whatever the arguments; -2 "Bad parameters"; else as DBAdd.
  /// Note: a bad address is logged ("Bad IP address[...]") and sets no code.
  bool Add(const std::string& username, const std::string& client_id, const std::string& scope,
           const std::string& refresh_token, const std::string& access_token,
           const std::string& expired_time, const std::string& flow_type, const std::string& state,
           const std::string& ip, Json::Value& result);

  // Changes -----------------------------------------------------------------

  /// Neither form changes the tokens, the address or the id. True when the row
  /// changed; false without an error code when there is none; false with -2
  /// "Bad parameters" for lengths out of the bounds above.
  /// Note: this form stores quotes as given.
  bool Edit(long long id, const std::string& username, const std::string& client_id,
            const std::string& scope, const std::string& flow_type, const std::string& state);
  /// Note: this form stores quotes doubled, but for expired_time.
  bool Edit(long long id, const std::string& username, const std::string& client_id,
            const std::string& scope, const std::string& expired_time, const std::string& flow_type,
            const std::string& state);

  /// Removes the row. True for the one caller that removed it; false without an
  /// error code when there is none (any more).
  bool Del(long long id);

  /// The row is gone: neither of its tokens is found again. As Del.
  bool Revoke(long long id);

  /// Removes every row whose expiry lies before the current second, refresh
  /// tokens included. True when all removals succeeded, also when there was
  /// nothing to remove or the rows could not be read; else false, without an
  /// error code when another process had removed a row first. Several removals
  /// are one transaction: when it cannot be committed, false with SQLite's
  /// code, and every row is back. When it cannot be begun because another
  /// process held the lock for the whole wait, false with 5 "database is
  /// locked", and nothing is removed; for another reason (a transaction of the
  /// caller's, say), they run one by one.
  bool Purge();

  // Look-ups ----------------------------------------------------------------

  /// The row of a token of 64 bytes, expired or not; true with an empty array
  /// when there is none. False: -2 "Bad parameters" for another length, `*rows`
  /// untouched. Access tokens are indexed; refresh tokens cost a table scan.
  bool GetWithAccessToken(const std::string& access_token, Json::Value* rows);
  bool GetWithRefreshToken(const std::string& refresh_token, Json::Value* rows);

  /// The row's id cut to 32 bits; 0 for no such token or a failure.
  int GetIndex(const std::string& access_token);

  /// The row with this id, and every row. True also without one.
  bool Get(long long id, Json::Value* rows);
  bool Get(Json::Value* rows);

  // Verification ------------------------------------------------------------

  /// True when the token is stored and does not expire before the current
  /// second: `result` receives "username", "scope" and "state" of its row.
  /// False: `result` receives "err_code" and "err_msg": -3 "Access Token
  /// Expired" when the token is unknown or expired, with the object's own error
  /// as it was; the object's error when the look-up failed (-2 for a token that
  /// is not 64 bytes long).
  /// Note: callers must not read a failed look-up as an invalid token.
  bool Verify(const std::string& access_token, Json::Value& result);
};

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_STORES_OAUTH_TOKEN_H
