// The form of a refresh token, all in lowercase hexadecimal digits:
//
//   1           the form's version
//   16 digits   the row that it belongs to
//   40 digits   its family: the same for all tokens of one login, random
//   40 digits   its own secret, random
//   8 digits    the start of the SHA-256 of all before
//
// So a token is found by its row's key, a mangled one is known as such without
// a look at the store, and nobody who never held a token of a login can end it.

#ifndef KELDOAUTH_GRANTS_ROWS_REFRESH_TEXT_H
#define KELDOAUTH_GRANTS_ROWS_REFRESH_TEXT_H

#include <optional>
#include <string>
#include <string_view>

namespace KELDOAUTHSERVER::grants::rows {

struct RefreshText {
  long long row;
  std::string family;
  std::string secret;
};

/// Draws a family, or the next secret of one. Throws Trouble.
RefreshText firstOf(long long row);
RefreshText nextOf(const RefreshText& token);

std::string write(const RefreshText& token);

/// Nothing for a text that `write` did not write.
std::optional<RefreshText> read(std::string_view text);

}  // namespace KELDOAUTHSERVER::grants::rows

#endif  // KELDOAUTH_GRANTS_ROWS_REFRESH_TEXT_H
