// What the columns do not hold rides in `state`, the one column whose text is
// ours. A text begins with what it is and its version, and then has one field
// after the other, each as its length, a colon and its bytes as they are:
//
//   c1  a code: when issued, redirect address, what holds of it (1: the address
//       was named, 2: it evicts nothing; their sum), method of the challenge
//       (S or P; empty without), challenge, caller's text
//   s1  a code that was spent: the same, then when it was spent, its token's
//       row and the family's mark
//   p1  a pushed request: when it was pushed, whether it was opened (1 or 0),
//       caller's text
//   t1  a token: when the present pair was issued, when its code was, and was
//       redeemed, mark of the family, marks of the refresh and access token
//       before, scope of the login where the row has a narrower one, caller's
//       text
//
// The times of issue and login go first, where a statement finds them.
//
// Nothing else in the library or above it reads or writes these texts.

#ifndef KELDOAUTH_GRANTS_ROWS_STATE_H
#define KELDOAUTH_GRANTS_ROWS_STATE_H

#include <optional>
#include <string>
#include <string_view>

namespace KELDOAUTHSERVER::grants::rows {

struct Spent {
  long long time;
  long long tokenRow;
  std::string family;  // mark
};

struct CodeState {
  std::string redirect;
  bool isNamed;
  std::string method;
  std::string challenge;
  long long issued;
  std::string text;
  std::optional<Spent> spent = {};
  bool evictsNothing = false;
};

struct PushedState {
  long long issued;
  bool isOpen;
  std::string text;
};

struct TokenState {
  long long login;
  long long redeemed;
  long long issued;
  std::string family;
  std::string refreshBefore;
  std::string accessBefore;
  std::string loginScope;  // empty: the row's own
  std::string text;
};

/// How the text of a spent code, of a pushed request and of a token begins.
inline constexpr char kSpentStart[] = "s1";
inline constexpr char kPushedStart[] = "p1";
inline constexpr char kTokenStart[] = "t1";

// Expressions of SQL: the time of issue in a text that `pack` wrote, and the
// login's in a token's.
std::string issuedTime();
std::string loginTime();

std::string pack(const CodeState& state);
std::string pack(const PushedState& state);
std::string pack(const TokenState& state);

/// Nothing for a text that `pack` did not write.
std::optional<CodeState> unpackCode(std::string_view text);
std::optional<PushedState> unpackPushed(std::string_view text);
std::optional<TokenState> unpackToken(std::string_view text);

/// Whether everything that the grant can ever need fits in the column: the
/// code redeemed, and its login refreshed with a narrower scope than `scope`.
bool fitsEver(const CodeState& state, const std::string& scope);

/// The same for a token that has no code.
bool fitsEver(const TokenState& state, const std::string& scope);

}  // namespace KELDOAUTHSERVER::grants::rows

#endif  // KELDOAUTH_GRANTS_ROWS_STATE_H
