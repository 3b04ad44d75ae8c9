// Storing and replacing tokens, within the transaction of an operation. Throw
// Trouble.

#ifndef KELDOAUTH_GRANTS_ROWS_ISSUING_H
#define KELDOAUTH_GRANTS_ROWS_ISSUING_H

#include <optional>
#include <string>

#include "grants/rows/read_rows.h"
#include "grants/rows/room_rules.h"
#include "grants/tokens.h"

namespace KELDOAUTHSERVER::grants::rows {

struct NewToken {
  std::optional<User> user;  // none: the application's own
  ApplicationId application;
  Scope scope;
  CallerText text;
  PeerAddress from;
  std::optional<long long> lifetime;
  long long login;  // when the user agreed
  bool ofSelfRegistered = false;
  Evicts evicts = Evicts::kOldest;
};

struct Stored {
  Pair pair;
  long long row;
  std::string family;  // mark
};

/// Makes the room first. Nothing when there is none and the token may not evict.
std::optional<Stored> storeToken(Store& store, const NewToken& token, long long now);

/// What takes the place of a login's pair.
struct Renewal {
  Scope scope;
  PeerAddress from;
  std::optional<long long> lifetime;
};

/// The row as it was read becomes the next one.
Pair replaceToken(Store& store, const TokenRow& old, const std::string& shown,
                  const Renewal& renewal, long long now);

}  // namespace KELDOAUTHSERVER::grants::rows

#endif  // KELDOAUTH_GRANTS_ROWS_ISSUING_H
