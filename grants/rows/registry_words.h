// What the registry remembers of an application in `redirect_uri`: its
// addresses, and behind them what no column holds, with blanks between them, as
// words that no address can be:
//
//   (none)              no address
//   (pkce-optional)     codes may be asked for without a challenge
//   (self)              registered itself
//   (logout:ADDRESS)    where a user may be sent after logging out
//   (es256)             wants that signature, and not RS256
//
// A word that is not known stays where it is.

#ifndef KELDOAUTH_GRANTS_ROWS_REGISTRY_WORDS_H
#define KELDOAUTH_GRANTS_ROWS_REGISTRY_WORDS_H

#include <string>
#include <string_view>
#include <vector>

namespace KELDOAUTHSERVER::grants::rows {

struct RegistryWords {
  std::vector<std::string> addresses;
  std::vector<std::string> logoutAddresses;
  bool isPkceOptional;
  bool registeredItself;
  std::vector<std::string> others;
  bool wantsEs256 = false;
};

std::string pack(const RegistryWords& words);
RegistryWords unpackWords(std::string_view text);

/// A condition of SQL: the row is of an application that registered itself.
std::string selfCondition();

}  // namespace KELDOAUTHSERVER::grants::rows

#endif  // KELDOAUTH_GRANTS_ROWS_REGISTRY_WORDS_H
