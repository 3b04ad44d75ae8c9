#include "core/oauth_db_basic.h"

#include <sqlite3.h>
#include <syslog.h>

#include <cstdint>
#include <exception>
#include <string>

#include "core/clauses.h"
#include "core/connection.h"
#include "core/log_lines.h"
#include "core/oauth_errors.h"
#include "core/row_callbacks.h"
#include "core/schema.h"
#include "core/secrets.h"
#include "core/unexpected.h"
#include "utils/decimal.h"
#include "utils/diagnostics.h"
#include "utils/oauth_names.h"
#include "utils/sql_text.h"
#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {
namespace {

using line::kSource;

/// What SQLite is given to carry to runRowCallback.
struct RowCall {
  OAUTHDBBasic::RowCallback callback;
  void* arg;
  std::exception_ptr thrown;
};

/// Parks an exception of the callback: none may cross SQLite's own frames.
int runRowCallback(void* arg, int count, char** values, char** columns) {
  auto& call = *static_cast<RowCall*>(arg);
  try {
    return call.callback(call.arg, count, values, columns);
  } catch (...) {
    call.thrown = std::current_exception();
    return SQLITE_ABORT;
  }
}

}  // namespace

// Opening and closing ---------------------------------------------------------

OAUTHDBBasic::OAUTHDBBasic() : errCode_(errors::kNone.code) {
  Open();
  DBInit();
}

OAUTHDBBasic::OAUTHDBBasic(const std::string& tableName, OAUTHDBBasic& store)
    : errCode_(errors::kNone.code), db_(store.db_), lender_(&store) {
  DBInit();
  SetTabName(tableName);
}

OAUTHDBBasic::~OAUTHDBBasic() {
  if (db_ == nullptr || lender_ != nullptr) return;

  const int result = closeConnection(kSource, db_);
  if (result != SQLITE_OK) {
    syslog(LOG_ERR, "%s:%d Close DB failed!![%d]", kSource, line::kCloseFailed, result);
  }
}

void OAUTHDBBasic::Open() try {
  const int result = openConnection(kSource, db_);
  if (result == SQLITE_OK) return;

  errCode_ = result;
  errMsg_ = errors::kOpenFailed;
  syslog(LOG_ERR, "%s:%d Open DB failed!![%d]", kSource, line::kOpenFailed, result);
} catch (...) {
  FailUnexpectedly(kSource, line::kOpenThrew);
}

bool OAUTHDBBasic::IsLent() const {
  return lender_ != nullptr;
}

// The last error --------------------------------------------------------------

int OAUTHDBBasic::GetErrCode() const {
  return errCode_;
}

void OAUTHDBBasic::SetErrCode(int code) {
  errCode_ = code;
}

std::string OAUTHDBBasic::GetErrMsg() const try { return errMsg_; } catch (const std::exception&) {
  return {};
}

void OAUTHDBBasic::SetErrMsg(const std::string& msg) try { errMsg_ = msg; } catch (...) {
  FailUnexpectedly(kSource, line::kSetErrMsgThrew);
}

bool OAUTHDBBasic::Fail(const OAUTHError& error) {
  errCode_ = error.code;
  errMsg_ = error.message;
  return false;
}

bool OAUTHDBBasic::FailUnexpectedly(const char* source, int line) noexcept {
  try {
    try {
      // cppcheck-suppress rethrowNoCurrentException ; called in handlers alone
      throw;
    } catch (const Json::LogicError&) {
      return Fail(errors::kBadParameters);
    } catch (const std::exception& thrown) {
      logUnexpected(source, line, thrown.what());
    } catch (...) {
      logUnexpected(source, line, "unknown");
    }
    return Fail({SQLITE_NOMEM, sqlite3_errstr(SQLITE_NOMEM)});
  } catch (...) {
    errMsg_.clear();  // no room even for the message: the code says it all
    return false;
  }
}

// The table -------------------------------------------------------------------

std::string OAUTHDBBasic::GetTabName() const try {
  return tabName_;
} catch (const std::exception&) {
  return {};
}

void OAUTHDBBasic::SetTabName(const std::string& name) try { tabName_ = name; } catch (...) {
  ready_ = 0;
  FailUnexpectedly(kSource, line::kSetTabNameThrew);
}

// Running statements ----------------------------------------------------------

int OAUTHDBBasic::DBCmd(const std::string& sql, RowCallback callback, Json::Value* arg) {
  traceEntry(kCoreTrace, kSource, line::kDBCmdEntry, __func__);
  if (db_ == nullptr || ready_ == 0) {
    syslog(LOG_ERR, "%s:%d DB is not ready!!", kSource, line::kNotReady);
    return 0;
  }
  return DBCmdRun(sql, callback, arg);
}

int OAUTHDBBasic::DBCmdRun(const std::string& sql, RowCallback callback, Json::Value* arg) try {
  return Run(sql, callback, arg);
} catch (...) {
  return FailUnexpectedly(kSource, line::kDBCmdRunThrew);
}

int OAUTHDBBasic::Run(const std::string& sql, RowCallback callback, Json::Value* arg) {
  if (isTraced(kCoreTrace)) {
    syslog(LOG_ERR, "%s:%d ==> %s[%s]", kSource, line::kDBCmdRunEntry, "DBCmdRun", sql.c_str());
  }
  return Execute(sql, callback, arg);
}

int OAUTHDBBasic::Execute(const std::string& sql, RowCallback callback, Json::Value* arg) {
  const OwnCallback* const own = findOwn(callback);
  if (own != nullptr && !canFill(*own, arg)) return Fail(errors::kBadParameters);

  RowCall call{own != nullptr ? own->body : callback, arg, nullptr};
  char* text = nullptr;
  const int result =
      sqlite3_exec(db_, sql.c_str(), callback != nullptr ? runRowCallback : nullptr, &call, &text);
  const SqliteText reason(text);
  if (call.thrown != nullptr) std::rethrow_exception(call.thrown);
  if (result == SQLITE_OK) return 1;

  // SQLite has no text where it had no connection or no memory for one.
  errCode_ = result;
  errMsg_ = reason != nullptr ? reason.get() : sqlite3_errstr(result);
  syslog(LOG_ERR, "%s:%d Run Command failed!![%s][%d]", kSource, line::kRunCommandFailed,
         errMsg_.c_str(), result);
  return 0;
}

bool OAUTHDBBasic::InTransaction() const {
  return db_ != nullptr && sqlite3_get_autocommit(db_) == 0;
}

// Schema ----------------------------------------------------------------------

int OAUTHDBBasic::DBInit() try {
  ready_ = lender_ != nullptr ? lender_->ready_ : 0;
  if (lender_ != nullptr || db_ == nullptr) return ready_;

  // Within a transaction SQLite keeps to the setting that stands.
  if (!InTransaction() && Execute(schema::kSyncFolderToo, nullptr, nullptr) == 0) return ready_;

  if (isTraced(kCoreTrace)) {
    syslog(LOG_ERR, "%s:%d ==> %s[init meta table]", kSource, line::kInitMetaEntry, __func__);
  }
  if (FindTable(names::kMetaTable) == 0) {
    if (CreateDBTab(schema::kMeta.statement) == 0) {
      syslog(LOG_ERR, "%s:%d Create Table failed!![meta]", kSource, line::kCreateMetaFailed);
      return ready_;
    }
    InsertMetaRows();
  }
  for (const schema::Step& step : schema::kSteps) {
    if (isTraced(step.mask)) {
      syslog(LOG_ERR, step.trace, kSource, step.entryLine, __func__);
    }
    if (CreateDBTab(step.table.statement) == 0) {
      syslog(LOG_ERR, "%s:%d Create Table failed!![%s]", kSource, step.failedLine, step.table.name);
      return ready_;
    }
  }
  ready_ = 1;
  return ready_;
} catch (...) {
  FailUnexpectedly(kSource, line::kDBInitThrew);
  return ready_;
}

void OAUTHDBBasic::AddMetaData() try { InsertMetaRows(); } catch (...) {
  FailUnexpectedly(kSource, line::kAddMetaDataThrew);
}

void OAUTHDBBasic::InsertMetaRows() {
  traceEntry(kCoreTrace, kSource, line::kAddMetaDataEntry, "AddMetaData");
  for (const char* table : schema::kVersionedTables) {
    const std::string sql = std::string("INSERT INTO ") + names::kMetaTable + "(" +
                            names::kTabName + ", " + names::kVersion + ") VALUES('" + table +
                            "', " + schema::kMetaVersion + ");";
    if (Run(sql, nullptr, nullptr) == 0) {
      syslog(LOG_ERR, "%s:%d Add Meta failed", kSource, line::kAddMetaFailed);
    }
  }
}

int OAUTHDBBasic::CreateDBTab(const std::string& statement) try {
  if (DBCmdRun(statement, nullptr, nullptr) == 0) return Fail(errors::kCreateTableFailed);
  if (isTraced(kCoreTrace)) {
    syslog(LOG_ERR, "%s:%d Create tab success", kSource, line::kCreateTabSuccess);
  }
  return 1;
} catch (...) {
  return FailUnexpectedly(kSource, line::kCreateDBTabThrew);
}

int OAUTHDBBasic::IsDBTabExist(const std::string& name) try {
  return FindTable(name);
} catch (...) {
  return FailUnexpectedly(kSource, line::kIsDBTabExistThrew);
}

int OAUTHDBBasic::FindTable(const std::string& name) {
  Json::Value found;
  found[names::kExist] = false;
  const std::string sql = "SELECT * FROM sqlite_master WHERE name='" + name + "' and type='table';";
  if (Run(sql, IsTabExistCallback, &found) == 0 || !found[names::kExist].asBool()) return 0;

  if (isTraced(kCoreTrace)) {
    syslog(LOG_ERR, "%s:%d Tab[%s] is exist", kSource, line::kTabIsExist, name.c_str());
  }
  return 1;
}

int OAUTHDBBasic::DBGetRowCount(Json::Value& result) try {
  traceEntry(kCoreTrace, kSource, line::kRowCountEntry, __func__);
  result = Json::Value(Json::arrayValue);
  const int status = DBCmd("SELECT COUNT(*) FROM " + tabName_ + ";", TabCountCallback, &result);
  if (status == 0) {
    syslog(LOG_ERR, "%s:%d Get Row Count failed[%s]", kSource, line::kRowCountFailed,
           tabName_.c_str());
  }
  return status;
} catch (...) {
  return FailUnexpectedly(kSource, line::kRowCountThrew);
}

int OAUTHDBBasic::DBCheckRowMax(unsigned long max) try {
  traceEntry(kCoreTrace, kSource, line::kCheckRowMaxEntry, __func__);
  Json::Value counts;
  if (DBGetRowCount(counts) == 0) {
    syslog(LOG_ERR, "%s:%d Check Row Max failed[%s]", kSource, line::kCheckRowMaxFailed,
           tabName_.c_str());
    return 0;
  }
  const unsigned long count = static_cast<std::uint32_t>(decimalValue(counts[0U]));
  if (isTraced(kStoreTrace)) {
    syslog(LOG_ERR, "%s:%d Table Row Count[%lu]", kSource, line::kTableRowCount, count);
  }
  return count < max ? 1 : 0;
} catch (...) {
  return FailUnexpectedly(kSource, line::kCheckRowMaxThrew);
}

int OAUTHDBBasic::DBDrop() try {
  traceEntry(kCoreTrace, kSource, line::kDropEntry, __func__);
  const int status = DBCmdRun("DROP TABLE IF EXISTS " + tabName_ + ";", nullptr, nullptr);
  if (status == 0 && isTraced(kStoreTrace)) {
    syslog(LOG_ERR, "%s:%d Drop [%s] failed", kSource, line::kDropFailed, tabName_.c_str());
  }
  return status;
} catch (...) {
  return FailUnexpectedly(kSource, line::kDropThrew);
}

// Request documents to SQL ----------------------------------------------------
//
// What is returned in place of a clause needs no memory, and SQLite refuses the
// statement that it would stand in.

std::string OAUTHDBBasic::GetInsertParam(const Json::Value& row) try {
  return insertClause(kSource, row);
} catch (...) {
  FailUnexpectedly(kSource, line::kInsertParamThrew);
  return kRefusedClause;
}

std::string OAUTHDBBasic::ConcateParam(const Json::Value& pairs, const std::string& separator) try {
  return joinPairs(kSource, pairs, separator);
} catch (...) {
  FailUnexpectedly(kSource, line::kConcateParamThrew);
  return kRefusedClause;
}

std::string OAUTHDBBasic::GetConditionParam(const Json::Value& condition) try {
  return conditionClause(kSource, condition);
} catch (...) {
  FailUnexpectedly(kSource, line::kConditionParamThrew);
  return kRefusedClause;
}

std::string OAUTHDBBasic::GetUpdateParam(const Json::Value& request) try {
  return updateClause(kSource, request);
} catch (...) {
  FailUnexpectedly(kSource, line::kUpdateParamThrew);
  return kRefusedClause;
}

// Rows ------------------------------------------------------------------------

bool OAUTHDBBasic::DBAdd(Json::Value& row) try {
  traceEntry(kCoreTrace, kSource, line::kAddEntry, __func__);
  if (!isPairs(row)) return Fail(errors::kBadParameters);
  if (!encryptSecrets(kSource, row)) return Fail(errors::kEncryptFailed);

  if (DBCmd("INSERT INTO " + tabName_ + insertClause(kSource, row) + ";", nullptr, nullptr) == 0) {
    syslog(LOG_ERR, "%s:%d Add failed[%s]", kSource, line::kAddFailed, tabName_.c_str());
    return false;
  }
  if (isTraced(kStoreTrace)) {
    syslog(LOG_ERR, "%s:%d [%s] Add success, changed[%d]", kSource, line::kAddSuccess,
           tabName_.c_str(), sqlite3_changes(db_));
  }
  return true;
} catch (...) {
  return FailUnexpectedly(kSource, line::kAddThrew);
}

bool OAUTHDBBasic::DBGet(Json::Value& request, Json::Value* result) try {
  traceEntry(kCoreTrace, kSource, line::kGetEntry, __func__);
  const Json::Value& asked = request;
  if (result == nullptr || !isRequest(asked) || !isPairs(asked[names::kCondition]) ||
      !hasText(asked[names::kConditionLike]) || !hasText(asked[names::kOption])) {
    return Fail(errors::kBadParameters);
  }
  if (!encryptSecrets(kSource, request[names::kCondition])) return Fail(errors::kDecryptFailed);

  *result = Json::Value(Json::arrayValue);
  std::string sql = "SELECT * FROM " + tabName_;
  sql += asked.isMember(names::kConditionLike) ? " WHERE " + asked[names::kConditionLike].asString()
                                               : conditionClause(kSource, asked[names::kCondition]);
  sql += " " + asked[names::kOption].asString() + ";";

  if (DBCmd(sql, TabGetCallback, result) == 0) {
    syslog(LOG_ERR, "%s:%d Get failed[%s]", kSource, line::kGetFailed, tabName_.c_str());
    return false;
  }
  if (isTraced(kStoreTrace)) {
    syslog(LOG_ERR, "%s:%d ClientInfo Get Done", kSource, line::kGetDone);
  }
  return true;
} catch (...) {
  return FailUnexpectedly(kSource, line::kGetThrew);
}

bool OAUTHDBBasic::DBEdit(Json::Value& request) try {
  traceEntry(kCoreTrace, kSource, line::kEditEntry, __func__);
  const Json::Value& asked = request;
  if (!isRequest(asked) || !isPairs(asked[names::kCondition]) ||
      !isPairs(asked[names::kModified])) {
    return Fail(errors::kBadParameters);
  }
  if (!encryptSecrets(kSource, request[names::kCondition])) return Fail(errors::kEncryptFailed);
  if (!encryptSecrets(kSource, request[names::kModified])) return Fail(errors::kEncryptFailed);

  int changed = 0;
  if (!RunChange("UPDATE " + tabName_ + updateClause(kSource, request) + ";", changed)) {
    syslog(LOG_ERR, "%s:%d Edit failed[%s]", kSource, line::kEditFailed, tabName_.c_str());
    return false;
  }
  if (isTraced(kStoreTrace)) {
    syslog(LOG_ERR, "%s:%d ClientInfo Edit success, changed[%d]", kSource, line::kEditSuccess,
           changed);
  }
  return true;
} catch (...) {
  return FailUnexpectedly(kSource, line::kEditThrew);
}

bool OAUTHDBBasic::DBDel(Json::Value& request) try {
  traceEntry(kCoreTrace, kSource, line::kDelEntry, __func__);
  const Json::Value& asked = request;
  if (!isRequest(asked) || !isPairs(asked[names::kCondition])) return Fail(errors::kBadParameters);
  if (!encryptSecrets(kSource, request[names::kCondition])) return Fail(errors::kEncryptFailed);

  int changed = 0;
  const std::string clause = conditionClause(kSource, asked[names::kCondition]);
  if (!RunChange("DELETE FROM " + tabName_ + clause + ";", changed)) {
    syslog(LOG_ERR, "%s:%d Delete failed[%s]", kSource, line::kDelFailed, tabName_.c_str());
    return false;
  }
  if (isTraced(kStoreTrace)) {
    syslog(LOG_ERR, "%s:%d ClientInfo Delete success, changed[%d]", kSource, line::kDelSuccess,
           changed);
  }
  return true;
} catch (...) {
  return FailUnexpectedly(kSource, line::kDelThrew);
}

/// True when the statement ran and changed at least one row.
bool OAUTHDBBasic::RunChange(const std::string& sql, int& changed) {
  if (DBCmd(sql, nullptr, nullptr) == 0) return false;
  changed = sqlite3_changes(db_);
  return changed > 0;
}

// Encryption ------------------------------------------------------------------

int OAUTHDBBasic::ParamEncrypt(Json::Value& doc) try {
  return encryptSecrets(kSource, doc) ? 1 : 0;
} catch (...) {
  return failWithoutObject(line::kParamEncryptThrew);
}

int OAUTHDBBasic::ParamDecrypt(Json::Value& doc) try {
  return decryptSecrets(kSource, doc) ? 1 : 0;
} catch (...) {
  return failWithoutObject(line::kParamDecryptThrew);
}

}  // namespace KELDOAUTHSERVER
