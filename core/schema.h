// What start-up does with a connection: how writes are synced, the steps that
// create the tables, and the rows of the meta table.

#ifndef KELDOAUTH_CORE_SCHEMA_H
#define KELDOAUTH_CORE_SCHEMA_H

#include <array>

#include "core/log_lines.h"
#include "core/tables.h"
#include "utils/diagnostics.h"
#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER::schema {

/// The removal of the journal is what commits. SQLite leaves that to the file
/// system, which may hold it back for seconds, unless it is told to sync the
/// folder as well.
inline constexpr char kSyncFolderToo[] = "PRAGMA synchronous=EXTRA;";

/// One step of start-up after the meta table.
struct Step {
  const Table& table;
  const char* trace;  // format of the entry line: source, number, function
  LogMask mask;       // of that line; it really differs between the steps
  int entryLine;
  int failedLine;
};

inline constexpr std::array<Step, 4> kSteps{{
    {kClientInfo, "%s:%d ==> %s[init client table]", kCoreTrace, line::kInitClientEntry,
     line::kCreateClientFailed},
    {kToken, "%s:%d ==> %s[init token table]", kStoreTrace, line::kInitTokenEntry,
     line::kCreateTokenFailed},
    {kGrantCode, "%s:%d ==> %s[init grantCode table]", kStoreTrace, line::kInitGrantCodeEntry,
     line::kCreateGrantCodeFailed},
    {kLog, "%s:%d ==> %s[init log table]", kStoreTrace, line::kInitLogEntry,
     line::kCreateLogFailed},
}};

/// The tables that get a row in the meta table when it is created, each with
/// the schema version. The version is written, never compared.
inline constexpr char kMetaVersion[] = "2";
inline constexpr std::array<const char*, 3> kVersionedTables{kClientInfo.name, kGrantCode.name,
                                                             kToken.name};

}  // namespace KELDOAUTHSERVER::schema

#endif  // KELDOAUTH_CORE_SCHEMA_H
