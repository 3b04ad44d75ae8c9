#include "core/clauses.h"

#include <algorithm>

#include "core/log_lines.h"
#include "utils/diagnostics.h"
#include "utils/oauth_names.h"
#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {
namespace {

void appendDoubled(std::string& sql, const char* text, const char* end) {
  while (text != end) {
    const char* quote = std::find(text, end, '\'');
    sql.append(text, quote);
    if (quote == end) return;
    sql += "''";
    text = quote + 1;
  }
}

/// A value without a text form becomes a token that SQLite refuses wherever it
/// stands: a statement must not run with half of what it was asked.
void appendLiteral(std::string& sql, const Json::Value& value) {
  if (!hasText(value)) {
    sql += kRefusedClause;
    return;
  }
  sql += '\'';
  const char* text = nullptr;
  const char* end = nullptr;
  if (value.getString(&text, &end)) {
    appendDoubled(sql, text, end);
  } else {
    sql += value.asString();  // a number, a boolean or null: no quotes in it
  }
  sql += '\'';
}

/// The one column that a null fills with the database's clock.
const char* nullValue(const std::string& column) {
  return column == names::kTimestamp ? "strftime('%s','now')" : "NULL";
}

}  // namespace

bool isRequest(const Json::Value& doc) {
  return doc.isNull() || doc.isObject();
}

bool isPairs(const Json::Value& doc) {
  return isRequest(doc) && std::all_of(doc.begin(), doc.end(), hasText);
}

bool hasText(const Json::Value& value) {
  return !value.isArray() && !value.isObject();
}

std::string insertClause(const char* source, const Json::Value& row) {
  traceEntry(kCoreTrace, source, line::kInsertParamEntry, "GetInsertParam");
  if (!isRequest(row)) return kRefusedClause;

  std::string columns;
  std::string values;
  for (auto member = row.begin(); member != row.end(); ++member) {
    if (!columns.empty()) {
      columns += ", ";
      values += ", ";
    }
    const std::string column = member.name();
    columns += column;
    if (member->isNull()) {
      values += nullValue(column);
    } else {
      appendLiteral(values, *member);
    }
  }
  return " (" + columns + ") VALUES(" + values + ")";
}

std::string joinPairs(const char* source, const Json::Value& pairs, const std::string& separator) {
  traceEntry(kCoreTrace, source, line::kConcateParamEntry, "ConcateParam");
  if (!pairs.empty() && !pairs.isObject()) return kRefusedClause;

  std::string clause;

  for (auto pair = pairs.begin(); pair != pairs.end(); ++pair) {
    if (!clause.empty()) clause += separator;
    clause += pair.name();
    clause += '=';
    appendLiteral(clause, *pair);
  }
  return clause;
}

std::string conditionClause(const char* source, const Json::Value& condition) {
  traceEntry(kCoreTrace, source, line::kConditionParamEntry, "GetConditionParam");
  if (condition.empty()) return {};
  return " WHERE " + joinPairs(source, condition, " and ");
}

std::string updateClause(const char* source, const Json::Value& request) {
  traceEntry(kCoreTrace, source, line::kUpdateParamEntry, "GetUpdateParam");
  if (!isRequest(request)) return kRefusedClause;
  std::string clause = " SET " + joinPairs(source, request[names::kModified], ", ");
  clause += conditionClause(source, request[names::kCondition]);
  return clause;
}

}  // namespace KELDOAUTHSERVER
