// The tables of the database file, in the order in which start-up creates
// them, and the rows of the meta table. The texts are part of the file format:
// SQLite stores them as they stand here, blanks included.

#ifndef KELDOAUTH_CORE_SCHEMA_H
#define KELDOAUTH_CORE_SCHEMA_H

#include <array>

#include "core/log_lines.h"
#include "utils/diagnostics.h"
#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER::schema {

inline constexpr char kCreateMeta[] =
    "CREATE TABLE IF NOT EXISTS oauth_meta(tab_name text NOT NULL, version integer NOT NULL);";

inline constexpr char kCreateClientInfo[] =
    "CREATE TABLE IF NOT EXISTS oauth_clientInfo(enable text NOT NULL, "
    "client_id text NOT NULL UNIQUE, client_secret text NOT NULL, redirect_uri text NOT NULL, "
    "scope text NOT NULL, display_name text NOT NULL, id integer PRIMARY KEY);";

inline constexpr char kCreateToken[] =
    "CREATE TABLE IF NOT EXISTS oauth_token(username text NOT NULL,  client_id text NOT NULL,  "
    "scope text NOT NULL,  refresh_token text NOT NULL, access_token text NOT NULL UNIQUE, "
    "expired_time text NOT NULL, flow_type text NOT NULL, state text NOT NULL, "
    "ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY);";

inline constexpr char kCreateGrantCode[] =
    "CREATE TABLE IF NOT EXISTS oauth_grantCode(username text NOT NULL, client_id text NOT NULL, "
    "scope text NOT NULL, code text NOT NULL UNIQUE, expired_time text NOT NULL, "
    "state text NOT NULL, ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY);";

inline constexpr char kCreateLog[] =
    "CREATE TABLE IF NOT EXISTS oauth_log(timestamp integer NOT NULL, msg text NOT NULL, "
    "id integer PRIMARY KEY);";

/// The removal of the journal is what commits. SQLite leaves that to the file
/// system, which may hold it back for seconds, unless it is told to sync the
/// folder as well.
inline constexpr char kSyncFolderToo[] = "PRAGMA synchronous=EXTRA;";

/// One step of start-up after the meta table.
struct Step {
  const char* table;
  const char* statement;
  const char* trace;  // format of the entry line: source, number, function
  LogMask mask;       // of that line; it really differs between the steps
  int entryLine;
  int failedLine;
};

inline constexpr std::array<Step, 4> kSteps{{
    {names::kClientInfoTable, kCreateClientInfo, "%s:%d ==> %s[init client table]", kCoreTrace,
     line::kInitClientEntry, line::kCreateClientFailed},
    {names::kTokenTable, kCreateToken, "%s:%d ==> %s[init token table]", kStoreTrace,
     line::kInitTokenEntry, line::kCreateTokenFailed},
    {names::kGrantCodeTable, kCreateGrantCode, "%s:%d ==> %s[init grantCode table]", kStoreTrace,
     line::kInitGrantCodeEntry, line::kCreateGrantCodeFailed},
    {names::kLogTable, kCreateLog, "%s:%d ==> %s[init log table]", kStoreTrace, line::kInitLogEntry,
     line::kCreateLogFailed},
}};

/// The tables that get a row in the meta table when it is created, each with
/// the schema version. The version is written, never compared.
inline constexpr char kVersion[] = "2";
inline constexpr std::array<const char*, 3> kVersionedTables{
    names::kClientInfoTable, names::kGrantCodeTable, names::kTokenTable};

}  // namespace KELDOAUTHSERVER::schema

#endif  // KELDOAUTH_CORE_SCHEMA_H
