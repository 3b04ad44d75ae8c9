// Rows as the operations see them: texts as they were given, `state` unpacked,
// and beside them what the columns hold, for the conditions of a change.

#ifndef KELDOAUTH_GRANTS_ROWS_READ_ROWS_H
#define KELDOAUTH_GRANTS_ROWS_READ_ROWS_H

#include <json/value.h>

#include <optional>
#include <string>

#include "grants/applications.h"
#include "grants/rows/refresh_text.h"
#include "grants/rows/registry_words.h"
#include "grants/rows/state.h"
#include "grants/rows/store.h"

namespace KELDOAUTHSERVER::grants::rows {

struct ApplicationRow {
  Application shown;
  std::string secret;
  RegistryWords words;
};

struct CodeRow {
  long long row;
  std::string user, application, scope, from;
  long long expires;
  std::optional<CodeState> state;  // none: another program's
  std::string storedCode, storedState;

  /// Stored by this floor.
  [[nodiscard]] bool isOurs() const;
  [[nodiscard]] bool isSpent() const { return isOurs() && state->spent; }
};

struct TokenRow {
  long long row;
  std::string user, application, scope, flow, from;
  long long expires;
  std::optional<TokenState> state;
  std::string storedAccess, storedRefresh, storedState;

  [[nodiscard]] bool isOurs() const;
  /// Of an application that acts for itself.
  [[nodiscard]] bool isOwn() const;
  /// The scope of the login, however narrow the present tokens are.
  [[nodiscard]] const std::string& loginScope() const;
  /// The last second in which it can be used or refreshed.
  [[nodiscard]] long long ends(const Policy& policy) const;
};

ApplicationRow applicationOf(const Json::Value& row);
CodeRow codeOf(const Json::Value& row);
TokenRow tokenOf(const Json::Value& row);

// One row by a column that is unique. Throw Trouble when they cannot look, and
// for a row whose identifier cannot be decrypted.

std::optional<ApplicationRow> findApplication(Store& store, const std::string& identifier);
/// The application if it may act: kInvalidClient otherwise.
Outcome<ApplicationRow> actingApplication(Store& store, const ApplicationId& identifier);

std::optional<CodeRow> findCode(Store& store, const char* column, const std::string& stored);
std::optional<TokenRow> findToken(Store& store, const char* column, const std::string& stored);

/// By what a bearer shows: its mark, or, of another program's row, the text as
/// it stands. A text that is a mark itself finds nothing, nor does the reference
/// of a pushed request.
std::optional<CodeRow> findShownCode(Store& store, const std::string& text);
std::optional<TokenRow> findShownAccess(Store& store, const std::string& text);
/// Another program's refresh token: costs a scan.
std::optional<TokenRow> findForeignRefresh(Store& store, const std::string& text);
/// The row that a refresh token of ours names, if it is of that family: the
/// token itself may have been replaced.
std::optional<TokenRow> loginOf(Store& store, const RefreshText& text);
/// Whether the user has a login with the application that can still be refreshed
/// and covers the scope. Another program's row says nothing of what a user
/// agreed to.
bool hasLogin(Store& store, const std::string& user, const std::string& application,
              const std::string& scope, long long now);
/// The row of a token, whichever of the two it is.
std::optional<TokenRow> findShownToken(Store& store, const std::string& text);

/// Names the row, and only as it was read.
Json::Value conditionOf(const CodeRow& code);
Json::Value conditionOf(const TokenRow& token);

/// Whether there was such a row.
bool erase(Store& store, const CodeRow& code);
bool erase(Store& store, const TokenRow& token);

/// How the secret's column of a public application begins.
inline constexpr char kPublicStart[] = "public:";

inline constexpr char kLoginFlow[] = "authorization_code";
inline constexpr char kOwnFlow[] = "client_credentials";

}  // namespace KELDOAUTHSERVER::grants::rows

#endif  // KELDOAUTH_GRANTS_ROWS_READ_ROWS_H
