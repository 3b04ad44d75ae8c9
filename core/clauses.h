// Request documents: what may stand in one, and the SQL clauses made of it.
//
// The builders throw where the members of OAUTHDBBasic that wrap them must not:
// a statement must never run with half of its clause.

#ifndef KELDOAUTH_CORE_CLAUSES_H
#define KELDOAUTH_CORE_CLAUSES_H

#include <json/value.h>

#include <string>

namespace KELDOAUTHSERVER {

/// A token that is none of SQL's, and short enough to need no memory: SQLite
/// refuses every statement in which it stands outside a literal.
inline constexpr char kRefusedClause[] = "\\";

/// True for null and for an object: what a request can be.
bool isRequest(const Json::Value& doc);

/// True for null and for an object of values that have a text form: what
/// "condition", "modified" and a new row can be.
bool isPairs(const Json::Value& doc);

/// True for everything but arrays and objects.
bool hasText(const Json::Value& value);

// Each writes the entry trace of the member function that it stands behind,
// under `source`.

std::string insertClause(const char* source, const Json::Value& row);
std::string joinPairs(const char* source, const Json::Value& pairs, const std::string& separator);
std::string conditionClause(const char* source, const Json::Value& condition);
std::string updateClause(const char* source, const Json::Value& request);

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_CORE_CLAUSES_H
