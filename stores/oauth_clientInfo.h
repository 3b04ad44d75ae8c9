// The registry of client applications: one row per application in
// names::kClientInfoTable. Identifier and secret are encrypted in the file and
// in the clear in every document that a caller sees.
//
// Rows come back as DBGet delivers them: an array of objects with "id",
// "enable", "client_id", "client_secret", "redirect_uri", "scope" and
// "display_name", every value a text. Single quotes were stored doubled in all
// but "enable".

#ifndef KELDOAUTH_STORES_OAUTH_CLIENTINFO_H
#define KELDOAUTH_STORES_OAUTH_CLIENTINFO_H

#include <string>

#include "core/oauth_db_basic.h"

namespace KELDOAUTHSERVER {

class OAUTHDBClientInfo : public OAUTHDBBasic {
 public:
  /// `tableName` is names::kClientInfoTable.
  explicit OAUTHDBClientInfo(const std::string& tableName);

  /// On the connection of `store`, which must outlive this object: nothing is
  /// opened, created or closed, and a transaction that is begun through one
  /// holds for both. Ready when `store` is, at this moment; the error state is
  /// this object's own.
  OAUTHDBClientInfo(const std::string& tableName, OAUTHDBBasic& store);

  // Registration ------------------------------------------------------------

  /// Registers an application and writes the audit entry
  /// "Application registed[<display_name>]", on a connection of its own, or, if
  /// this object works on another's, on that one and in its transaction. (So an
  /// object that has a connection of its own and a transaction open registers
  /// without an entry: the entry waits for the transaction's lock, in vain.)
  /// Lengths in bytes:
  ///   client_id      64, not yet registered
  ///   client_secret  64
  ///   redirect_uri   3 to 2048 after one leading "https://" or "http://" is
  ///                  removed; without it it is stored
  ///   scope          1 to 2048
  ///   display_name   1 to 64
  ///   enable         "1" or "0"
  /// `out` receives "client_id" and "client_secret" as soon as the arguments
  /// are accepted, so also when the insert then fails; nothing before that.
  /// Non-zero when the row was stored, whatever became of the audit entry. (An
  /// entry that ends the caller's transaction takes the row with it and leaves
  /// no code here: Transaction::IsLost says so.)
  /// 0: -5 "ClientInfo Table is full" when names::kClientInfoMax rows are
  /// there, whatever the arguments; -2 "Bad parameters"; else as DBAdd.
  int Add(const std::string& client_id, const std::string& client_secret,
          const std::string& redirect_uri, const std::string& scope,
          const std::string& display_name, const std::string& enable, Json::Value& out);

  /// The same, enabled, with a generated identifier and secret.
  int Add(const std::string& redirect_uri, const std::string& scope,
          const std::string& display_name, Json::Value& out);

  /// The same, enabled, with a generated identifier and the caller's secret.
  int Add(const std::string& client_secret, const std::string& redirect_uri,
          const std::string& scope, const std::string& display_name, Json::Value& out);

  // Changes -----------------------------------------------------------------

  /// Non-zero when the row changed; 0 without an error code when there is none.
  /// 0: -2 "Bad parameters" for lengths out of the bounds above.
  /// Note: the redirect address is stored as given, with its scheme.
  int Edit(long long id, const std::string& redirect_uri, const std::string& scope,
           const std::string& display_name);

  /// "enable" becomes "1" or "0". Non-zero also when it was so before; 0
  /// without an error code when there is no such row.
  int Enable(long long id);
  int Disable(long long id);

  /// Removes the application. Its grant codes and tokens stay in their tables.
  /// 0 without an error code when there is no such row.
  int Del(long long id);

  // Look-ups ----------------------------------------------------------------

  /// The row of an identifier of 64 bytes; non-zero with an empty array when
  /// there is none. 0: -2 "Bad parameters" for another length, `*out` untouched.
  int Get(const std::string& client_id, Json::Value* out);

  /// The row's id cut to 32 bits; 0 for no such application or a failure.
  int GetIndex(const std::string& client_id);

  /// The row with this id, and every row. Non-zero also without one.
  int Get(long long id, Json::Value* out);
  int Get(Json::Value* out);
};

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_STORES_OAUTH_CLIENTINFO_H
