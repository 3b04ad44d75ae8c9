// The tables of the database file and their columns. The statements are part of
// the file format: SQLite stores them as they stand here, blanks included.

#ifndef KELDOAUTH_CORE_TABLES_H
#define KELDOAUTH_CORE_TABLES_H

#include <cstddef>
#include <string_view>

#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER::schema {

/// A list of columns that stands elsewhere. Its length is counted where it is
/// taken: a null at the end would have to be asked of addresses, which is no
/// constant expression to gcc's sanitizers.
class Columns {
 public:
  template <std::size_t size>
  constexpr Columns(const char* const (&list)[size]) : first_(list), size_(size) {}

  [[nodiscard]] constexpr const char* const* begin() const { return first_; }
  [[nodiscard]] constexpr const char* const* end() const { return first_ + size_; }

 private:
  const char* const* first_;
  std::size_t size_;
};

struct Table {
  const char* name;
  const char* statement;  // creates it unless it is there
  Columns columns;        // in the statement's order
};

inline constexpr const char* kMetaColumns[] = {names::kTabName, names::kVersion};
inline constexpr Table kMeta{
    names::kMetaTable,
    "CREATE TABLE IF NOT EXISTS oauth_meta(tab_name text NOT NULL, version integer NOT NULL);",
    kMetaColumns};

inline constexpr const char* kClientInfoColumns[] = {
    names::kEnable,      names::kClientId, names::kClientSecret, names::kRedirectUri, names::kScope,
    names::kDisplayName, names::kId};
inline constexpr Table kClientInfo{
    names::kClientInfoTable,
    "CREATE TABLE IF NOT EXISTS oauth_clientInfo(enable text NOT NULL, "
    "client_id text NOT NULL UNIQUE, client_secret text NOT NULL, redirect_uri text NOT NULL, "
    "scope text NOT NULL, display_name text NOT NULL, id integer PRIMARY KEY);",
    kClientInfoColumns};

inline constexpr const char* kTokenColumns[] = {
    names::kUsername,    names::kClientId, names::kScope, names::kRefreshToken, names::kAccessToken,
    names::kExpiredTime, names::kFlowType, names::kState, names::kIp,           names::kId};
inline constexpr Table kToken{
    names::kTokenTable,
    "CREATE TABLE IF NOT EXISTS oauth_token(username text NOT NULL,  client_id text NOT NULL,  "
    "scope text NOT NULL,  refresh_token text NOT NULL, access_token text NOT NULL UNIQUE, "
    "expired_time text NOT NULL, flow_type text NOT NULL, state text NOT NULL, "
    "ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY);",
    kTokenColumns};

inline constexpr const char* kGrantCodeColumns[] = {
    names::kUsername,    names::kClientId, names::kScope, names::kCode,
    names::kExpiredTime, names::kState,    names::kIp,    names::kId};
inline constexpr Table kGrantCode{
    names::kGrantCodeTable,
    "CREATE TABLE IF NOT EXISTS oauth_grantCode(username text NOT NULL, client_id text NOT NULL, "
    "scope text NOT NULL, code text NOT NULL UNIQUE, expired_time text NOT NULL, "
    "state text NOT NULL, ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY);",
    kGrantCodeColumns};

inline constexpr const char* kLogColumns[] = {names::kTimestamp, names::kMsg, names::kId};
inline constexpr Table kLog{
    names::kLogTable,
    "CREATE TABLE IF NOT EXISTS oauth_log(timestamp integer NOT NULL, msg text NOT NULL, "
    "id integer PRIMARY KEY);",
    kLogColumns};

/// In the order in which start-up creates them.
inline constexpr const Table* kTables[] = {&kMeta, &kClientInfo, &kToken, &kGrantCode, &kLog};

// The statements spell the names once more. Nothing is compiled that spells one
// of them otherwise, leaves one out or has one more.

/// Takes `word` away from the front of `text`; false when something else stands
/// there.
constexpr bool takeWord(std::string_view& text, std::string_view word) {
  if (text.substr(0, word.size()) != word) return false;
  text.remove_prefix(word.size());
  return true;
}

constexpr bool declares(std::string_view text, const Table& table) {
  if (!takeWord(text, "CREATE TABLE IF NOT EXISTS ") || !takeWord(text, table.name)) return false;
  std::string_view separator = "(";
  for (const char* const column : table.columns) {
    if (!takeWord(text, separator)) return false;
    while (takeWord(text, " ")) {
    }
    if (!takeWord(text, column) || !takeWord(text, " ")) return false;
    text.remove_prefix(text.find_first_of(",)"));
    separator = ",";
  }
  return text == ");";
}

static_assert(declares(kMeta.statement, kMeta));
static_assert(declares(kClientInfo.statement, kClientInfo));
static_assert(declares(kToken.statement, kToken));
static_assert(declares(kGrantCode.statement, kGrantCode));
static_assert(declares(kLog.statement, kLog));

}  // namespace KELDOAUTHSERVER::schema

#endif  // KELDOAUTH_CORE_TABLES_H
