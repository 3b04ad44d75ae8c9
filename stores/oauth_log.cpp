#include "stores/oauth_log.h"

#include <syslog.h>

#include <exception>

#include "utils/diagnostics.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"
#include "utils/sql_text.h"
#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {
namespace {

constexpr char kSource[] = "oauth_log";

/// The numbers that this source's lines carry.
enum Line : int {
  kAddLine = 16,
  kRotateFailedLine = 32,
  kDelLine = 41,
  kGetLine = 51,

  // "Unexpected failure"
  kAddThrew = 901,
  kGetThrew = 902,
  kDelThrew = 903,
};

/// Keyed on the time stamp, so that one second is kept or trimmed as a whole.
std::string rotationStatement(const std::string& table) {
  const std::string limit = std::to_string(getTableRowMax(names::kLogMax));
  const std::string time = names::kTimestamp;
  return "DELETE FROM " + table + " WHERE " + time + " IN (SELECT " + time + " FROM " + table +
         " ORDER BY " + time + " DESC LIMIT -1 OFFSET " + limit + ")";
}

/// Whatever stops it, the row that was just stored stays stored.
void rotate(OAUTHDBLog& log) {
  bool done = false;
  try {
    done = log.DBCmd(rotationStatement(log.GetTabName()), nullptr, nullptr) != 0;
  } catch (const std::exception&) {
    done = false;
  }
  if (!done && isDebugEnabled()) {
    syslog(LOG_ERR, "%s:%d Log rotate failed", kSource, kRotateFailedLine);
  }
}

}  // namespace

OAUTHDBLog::OAUTHDBLog(const std::string& tableName) {
  SetTabName(tableName);
}

OAUTHDBLog::OAUTHDBLog(const std::string& tableName, OAUTHDBBasic& store)
    : OAUTHDBBasic(tableName, store) {}

int OAUTHDBLog::Add(const std::string& msg) try {
  traceEntry(kStoreTrace, kSource, kAddLine, "Add");
  Json::Value row;
  row[names::kMsg] = quoteSql(msg);
  row[names::kTimestamp] = Json::Value();
  row[names::kId] = Json::Value();
  const bool added = DBAdd(row);
  rotate(*this);
  return added;
} catch (...) {
  return FailUnexpectedly(kSource, kAddThrew);
}

int OAUTHDBLog::Get(const std::string& filter, const std::string& option, Json::Value* rows) try {
  traceEntry(kStoreTrace, kSource, kGetLine, "Get");
  Json::Value request;
  request[names::kCondition] = Json::Value();
  if (!option.empty()) request[names::kOption] = quoteSql(option);
  if (!filter.empty()) request[names::kConditionLike] = likeSql(names::kMsg, filter);
  return DBGet(request, rows);
} catch (...) {
  return FailUnexpectedly(kSource, kGetThrew);
}

int OAUTHDBLog::Del() try {
  traceEntry(kStoreTrace, kSource, kDelLine, "Del");
  Json::Value request;
  request[names::kCondition] = Json::Value();
  return DBDel(request);
} catch (...) {
  return FailUnexpectedly(kSource, kDelThrew);
}

}  // namespace KELDOAUTHSERVER
