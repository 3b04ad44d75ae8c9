// The grant codes: one row per authorisation code in names::kGrantCodeTable.
// The store holds rows; whether a code is still valid, and for whom, is for the
// caller to decide: an expired code is found until it is purged or deleted.
//
// To redeem a code exactly once, read it with Get, check it, then delete it *by
// the code*, and go on only when that succeeds:
//
//   Json::Value request;
//   request["condition"]["code"] = code;
//   bool redeemed = codes.DBDel(request);
//
// Of several requests that redeem the same code at the same moment, one removes
// the row and all others get false. Two other ways let more than one through:
// - Revoke succeeds for each of them;
// - Del goes by the row's id, and SQLite gives the highest id out again: when
//   the row is gone, the same id may be another code's by now.
//
// Rows come back as DBGet delivers them: an array of objects with "id",
// "username", "client_id", "scope", "code", "expired_time", "state" and "ip",
// every value a text.

#ifndef KELDOAUTH_STORES_OAUTH_GRANTCODE_H
#define KELDOAUTH_STORES_OAUTH_GRANTCODE_H

#include <string>

#include "core/oauth_db_basic.h"

namespace KELDOAUTHSERVER {

class OAUTHDBGrantCode : public OAUTHDBBasic {
 public:
  /// `tableName` is names::kGrantCodeTable.
  explicit OAUTHDBGrantCode(const std::string& tableName);

  /// On the connection of `store`, which must outlive this object: nothing is
  /// opened, created or closed, and a transaction that is begun through one
  /// holds for both. Ready when `store` is, at this moment; the error state is
  /// this object's own.
  OAUTHDBGrantCode(const std::string& tableName, OAUTHDBBasic& store);

  // Issuing -----------------------------------------------------------------

  /// Stores a code. Lengths in bytes:
  ///   username      1 to 256
  ///   client_id     64
  ///   scope         1 to 2048
  ///   code          64, not yet stored
  ///   expired_time  1 to 128; Unix seconds as decimal text
  ///   state         1 to 2048
  ///   ip            an IPv4 or IPv6 address, or empty
  /// `out` receives "code" as soon as the arguments are accepted, so also when
  /// the insert then fails; nothing before that.
  /// Single quotes in the values are stored doubled, but for expired_time and
  /// ip, which are stored as given.
  /// 0: -5 "GrantCode Table is full" when names::kGrantCodeMax rows are there,
  /// whatever the arguments; else as DBAdd.
  /// Note: a bad address and a bad length are logged ("Bad IP address[...]",
  /// "Bad parameters") and set no error code here.
  int Add(const std::string& username, const std::string& client_id, const std::string& scope,
          const std::string& code, const std::string& expired_time, const std::string& state,
          const std::string& ip, Json::Value& out);

  /// The same with a generated code that expires names::kGrantCodeExpired
  /// seconds from now.
  int Add(const std::string& username, const std::string& client_id, const std::string& scope,
          const std::string& state, const std::string& ip, Json::Value& out);

  // Changes -----------------------------------------------------------------

  /// Both give non-zero when the row changed and 0 without an error code when
  /// there is none. Note: a length out of the bounds above is logged and sets
  /// no error code.
  /// Note: this form stores quotes as given.
  int Edit(long long id, const std::string& username, const std::string& client_id,
           const std::string& scope, const std::string& state);
  /// Note: this form stores quotes doubled, but for expired_time.
  int Edit(long long id, const std::string& username, const std::string& client_id,
           const std::string& scope, const std::string& expired_time, const std::string& state);

  /// The code expires now. The row stays: the next Get still finds it, with the
  /// current second as its expiry, and a Purge after that second removes it.
  int Revoke(long long id);

  /// Removes the row. Non-zero for the one caller that removed it; 0 without an
  /// error code when there is none (any more). Not the way to redeem a code: see
  /// the head of this file.
  int Del(long long id);

  /// Removes every row whose expiry lies before the current second. 1 when all
  /// removals succeeded, also when there was nothing to remove or the rows
  /// could not be read; else 0, without an error code when another process had
  /// removed a row first. Several removals are one transaction: when it cannot
  /// be committed, 0 with SQLite's code, and every row is back. When it cannot
  /// be begun because another process held the lock for the whole wait, 0 with
  /// 5 "database is locked", and nothing is removed; for another reason (a
  /// transaction of the caller's, say), they run one by one.
  int Purge();

  // Look-ups ----------------------------------------------------------------

  /// The row of a code of 64 bytes, expired or not; non-zero with an empty
  /// array when there is none. 0: -2 "Bad parameters" for another length,
  /// `*out` untouched.
  int Get(const std::string& code, Json::Value* out);

  /// The row's id cut to 32 bits; 0 for no such code or a failure.
  int GetIndex(const std::string& code);

  /// The row with this id, and every row. Non-zero also without one.
  int Get(long long id, Json::Value* out);
  int Get(Json::Value* out);
};

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_STORES_OAUTH_GRANTCODE_H
