// What codes and tokens have in common: both were granted to an application,
// are listed, ended and purged alike.

#ifndef KELDOAUTH_TOOLS_ACCESS_H
#define KELDOAUTH_TOOLS_ACCESS_H

#include <string>

#include "grants/grants.h"
#include "tools/keldoauth/commands/audit.h"
#include "tools/keldoauth/commands/chosen.h"
#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/console/output.h"

namespace tool {

Answer listAccess(Table table, const Arguments& arguments);
Answer showAccess(Table table, const Arguments& arguments);

// Ending ------------------------------------------------------------------------

/// Ends what ids, a file, --username and --client, or --all name: one way of
/// the four.
Answer revokeAccess(Table table, const Arguments& arguments);

/// Deletes the rows that ids or a file name, dead ones too.
Answer removeAccess(Table table, const Arguments& arguments);

void printEnded(Table table, const std::string& verb, const Json::Value& document,
                std::ostream& out);

// Purging -----------------------------------------------------------------------

Answer purgeAccess(Table table, const Arguments& arguments);

/// A table of what was purged, or would be, and a line that counts it.
void printPurged(Table table, const Columns& columns, const Json::Value& document,
                 std::ostream& out);

// Issuing -----------------------------------------------------------------------

/// A request that was refused for what it asks; `fault` (may be empty) says
/// which value is meant.
Failure refusedRequest(const KELDOAUTHSERVER::grants::Refusal& refusal, const std::string& fault);

/// A code or token that is not good.
Failure notGood(const std::string& what, const KELDOAUTHSERVER::grants::Refusal& refusal);

/// The pair that was just issued: the row as it stands, with the texts of both.
Json::Value presentPair(const KELDOAUTHSERVER::grants::Grants& grants,
                        const KELDOAUTHSERVER::grants::Pair& pair);

/// What --username, --scope, --state and --ip are not accepted for; empty when
/// nothing is wrong with them.
std::string faultInGrant(const Arguments& arguments);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_ACCESS_H
