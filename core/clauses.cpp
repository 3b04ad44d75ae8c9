#include "core/clauses.h"

#include <algorithm>

#include "utils/diagnostics.h"
#include "utils/oauth_names.h"

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

void appendLiteral(std::string& sql, const Json::Value& value) {
  sql += '\'';
  const char* text = nullptr;
  const char* end = nullptr;
  if (value.getString(&text, &end)) {
    appendDoubled(sql, text, end);
  } else if (hasText(value)) {
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
  traceEntry(kCoreTrace, source, __LINE__, "GetInsertParam");
  std::string columns;
  std::string values;
  if (row.isObject()) {
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
  }
  return " (" + columns + ") VALUES(" + values + ")";
}

std::string joinPairs(const char* source, const Json::Value& pairs, const std::string& separator) {
  traceEntry(kCoreTrace, source, __LINE__, "ConcateParam");
  std::string clause;
  if (!pairs.isObject()) return clause;

  for (auto pair = pairs.begin(); pair != pairs.end(); ++pair) {
    if (!clause.empty()) clause += separator;
    clause += pair.name();
    clause += '=';
    appendLiteral(clause, *pair);
  }
  return clause;
}

std::string conditionClause(const char* source, const Json::Value& condition) {
  traceEntry(kCoreTrace, source, __LINE__, "GetConditionParam");
  if (condition.empty()) return {};
  return " WHERE " + joinPairs(source, condition, " and ");
}

std::string updateClause(const char* source, const Json::Value& request) {
  traceEntry(kCoreTrace, source, __LINE__, "GetUpdateParam");
  if (!isRequest(request)) return " SET ";
  std::string clause = " SET " + joinPairs(source, request[names::kModified], ", ");
  clause += conditionClause(source, request[names::kCondition]);
  return clause;
}

}  // namespace KELDOAUTHSERVER
