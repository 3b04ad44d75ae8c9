// The library's stores as the commands use them: each on its table, ready when
// constructed, with every failure thrown as a Failure.

#ifndef KELDOAUTH_TOOLS_STORES_H
#define KELDOAUTH_TOOLS_STORES_H

#include <json/value.h>

#include <string>

#include "core/oauth_errors.h"
#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "tools/keldoauth/console/clock.h"
#include "tools/keldoauth/console/failure.h"
#include "tools/keldoauth/storage/rows.h"
#include "utils/oauth_names.h"

namespace tool {

/// Throws when the constructor of `store` could not make it ready.
void requireReady(KELDOAUTHSERVER::OAUTHDBBasic& store);

struct Clients : KELDOAUTHSERVER::OAUTHDBClientInfo {
  static constexpr char kNoun[] = "client";
  static constexpr char kPlural[] = "clients";
  static constexpr char kWhenFull[] =
      "remove clients, or raise client_info_max in the settings (at most 10000)";
  static constexpr auto kPresent = presentClient;
  Clients();
};

struct Codes : KELDOAUTHSERVER::OAUTHDBGrantCode {
  static constexpr char kNoun[] = "code";
  static constexpr char kPlural[] = "codes";
  static constexpr char kWhenFull[] =
      "'keldoauth code purge' removes expired codes; grantcode_max in the settings "
      "is the limit (at most 10000)";
  static constexpr auto kPresent = presentCode;
  Codes();
  static constexpr auto isExpired = isExpiredCode;
};

struct Tokens : KELDOAUTHSERVER::OAUTHDBToken {
  static constexpr char kNoun[] = "token";
  static constexpr char kPlural[] = "tokens";
  static constexpr char kWhenFull[] =
      "'keldoauth token purge' removes expired tokens; token_max in the settings "
      "is the limit (at most 10000)";
  static constexpr auto kPresent = presentToken;
  Tokens();
  static constexpr auto isExpired = isExpiredToken;
};

struct Log : KELDOAUTHSERVER::OAUTHDBLog {
  Log();
};

/// The failure of an operation that checks values: `explanation` says which
/// value is at fault.
template <typename Store>
Failure refused(Store& store, const std::string& explanation) {
  const bool isFull = store.GetErrCode() == KELDOAUTHSERVER::errors::kTokenFull.code;
  return libraryFailure(store, isFull ? Store::kWhenFull : explanation);
}

template <typename Store>
Json::Value allRows(Store& store) {
  Json::Value rows(Json::arrayValue);
  if (!store.Get(&rows)) throw libraryFailure(store);
  return rows;
}

template <typename Store>
Json::Value rowById(Store& store, long long id) {
  Json::Value rows(Json::arrayValue);
  if (!store.Get(id, &rows)) throw libraryFailure(store);
  if (rows.empty()) throw notFound(Store::kNoun + (" " + std::to_string(id)));
  return rows[0U];
}

/// Everything between construction and commit() happens whole or not at all,
/// and nobody else writes meanwhile.
class Transaction {
 public:
  explicit Transaction(KELDOAUTHSERVER::OAUTHDBBasic& store);
  ~Transaction();
  Transaction(const Transaction&) = delete;
  Transaction& operator=(const Transaction&) = delete;

  void commit();

 private:
  KELDOAUTHSERVER::OAUTHDBBasic& store_;
  bool isOpen_ = true;
};

/// Ends the command when `row` is not there any more as it was read. Row ids
/// are given out again: the one that was shown may be another's by now.
template <typename Store>
void requireUnchanged(Store& store, const Json::Value& row) {
  const long long id = numberIn(row[KELDOAUTHSERVER::names::kId]);
  if (rowById(store, id) != row) {
    throw Failure(kNotFound, Store::kNoun + (" " + std::to_string(id)) + " has just changed",
                  "nothing was done; look at it again");
  }
}

/// Removes a row that the running transaction has seen.
template <typename Store>
void removeSeen(Store& store, const Json::Value& row) {
  if (!store.Del(numberIn(row[KELDOAUTHSERVER::names::kId]))) throw libraryFailure(store);
}

/// Removes a row that the user has seen.
template <typename Store>
void removeUnchanged(Store& store, const Json::Value& row) {
  Transaction transaction(store);
  requireUnchanged(store, row);
  removeSeen(store, row);
  transaction.commit();
}

/// The row of the client that `text` names: a row id or an identifier of 64
/// bytes. Throws kUsage for anything else and kNotFound for an unknown one.
Json::Value requireClient(Clients& clients, const std::string& text);
Json::Value requireClient(const std::string& text);

/// The identifier alone. One of 64 bytes is taken as it is, since codes and
/// tokens outlive their client.
std::string clientIdentifier(const std::string& text);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_STORES_H
