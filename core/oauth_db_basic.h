// The storage core: one connection to the database file, the last error, the
// schema, and the four operations through which every store reads and writes
// its rows. Callers use the stores; what stands here is what they share.
//
// Rules that hold for every member function here and in the stores:
// - Nothing throws. Out of memory and a failing random source make an operation
//   fail with code 7 ("out of memory") and one line "Unexpected failure".
// - An operation returns non-zero or true on success. A success leaves the code
//   and the message on the object as they were, and so do a few failures; each
//   says so.
// - An object belongs to one thread at a time, and so do all objects on one
//   connection. Constructing and destroying switches the ids of the whole
//   process: one thread at a time there, too.

#ifndef KELDOAUTH_CORE_OAUTH_DB_BASIC_H
#define KELDOAUTH_CORE_OAUTH_DB_BASIC_H

#include <json/value.h>

#include <string>

struct sqlite3;

namespace KELDOAUTHSERVER {

struct OAUTHError;  // core/oauth_errors.h

class OAUTHDBBasic {
 public:
  /// SQLite's row callback; it returns 0 so that SQLite goes on. An exception
  /// in it ends the statement and the operation fails as said above.
  using RowCallback = int (*)(void*, int, char**, char**);

  /// Opens names::kDatabaseFile with raised privileges, creates the file (mode
  /// 0600) and any missing table, and keeps the connection for life. A
  /// statement that meets another process's lock waits up to 5 seconds for it.
  /// When the file cannot be opened: SQLite's code, "Open DB failed!!". When it
  /// is no database or stays locked: SQLite's code and text. When a table
  /// cannot be created: -1, "Create table failed". In each case the object is
  /// not ready and refuses every later operation; there is no reopen.
  OAUTHDBBasic();

  /// Closes the connection, again with raised privileges, unless it is lent.
  ~OAUTHDBBasic();

  OAUTHDBBasic(const OAUTHDBBasic&) = delete;
  OAUTHDBBasic& operator=(const OAUTHDBBasic&) = delete;

  // The last error ----------------------------------------------------------

  /// 255 until something has failed; see core/oauth_errors.h.
  int GetErrCode() const;
  void SetErrCode(int code);

  /// Empty until something has failed.
  std::string GetErrMsg() const;
  void SetErrMsg(const std::string& msg);

  // The table that this object works on -------------------------------------

  std::string GetTabName() const;
  /// When memory runs out the object is no longer ready.
  void SetTabName(const std::string& name);

  // Running statements ------------------------------------------------------

  /// Runs `sql`, one or more statements, with `callback` (may be null) called
  /// as callback(arg, ...) for each row. 1 on success. An object that is not
  /// ready gets 0, the line "DB is not ready!!", and no error code. A statement
  /// that fails gets 0 and SQLite's code and text.
  int DBCmd(const std::string& sql, RowCallback callback, Json::Value* arg);

  /// The same without the check for readiness: start-up runs through it.
  int DBCmdRun(const std::string& sql, RowCallback callback, Json::Value* arg);

  /// True between a BEGIN, by whichever object on the connection, and the end
  /// of its transaction, which need not be a COMMIT: a statement that meets an
  /// I/O error, a full medium or no memory makes SQLite roll back by itself.
  bool InTransaction() const;

  // The library's own callbacks. `arg` is a Json::Value, an array (an object
  // for the second) or null; DBCmd refuses another one, or none, before the
  // statement: 0, -2 "Bad parameters". Called by hand they always return 0, and
  // add nothing to such an `arg`.

  /// Appends the first column as text to the array behind `arg`.
  static int TabCountCallback(void* arg, int count, char** values, char** columns);
  /// Sets the member "exist" of the object behind `arg` to true.
  static int IsTabExistCallback(void* arg, int count, char** values, char** columns);
  /// Appends the row, decrypted, as an object of texts to the array behind
  /// `arg`. NULL reads as the empty text. A row that cannot be decrypted is
  /// appended as it is, with the line "Decrypt data failed".
  static int TabGetCallback(void* arg, int count, char** values, char** columns);

  // Schema ------------------------------------------------------------------

  /// Has SQLite sync what commits a change before it acknowledges the change
  /// (within a transaction it allows no such thing, and the setting stays as it
  /// is), creates what is missing and marks the object ready; returns the ready
  /// flag, which is cleared first. Does nothing without a connection. On a lent
  /// connection it takes over whether the lending object is ready, no more. The
  /// constructors call it.
  int DBInit();

  /// Inserts the three rows of the meta table. A row that fails is logged and
  /// skipped.
  void AddMetaData();

  /// Runs one CREATE statement. 1 on success; 0, -1 "Create table failed".
  int CreateDBTab(const std::string& statement);

  /// 1 when a table of this name exists. `name` goes into the statement as it
  /// stands: never outside input.
  int IsDBTabExist(const std::string& name);

  /// Makes `result` an array with one text, the number of rows of the table.
  /// Returns DBCmd's result.
  int DBGetRowCount(Json::Value& result);

  /// 1 when the table holds fewer than `max` rows. 0 when it is full, and also
  /// when the count failed.
  int DBCheckRowMax(unsigned long max);

  /// Drops the table, ready or not; one that does not exist is a success. It
  /// comes back, empty, with the next object. Returns DBCmdRun's result.
  int DBDrop();

  // Request documents to SQL ------------------------------------------------
  //
  // Every value becomes a text literal with its quotes doubled; member names
  // are columns and go in as they stand: never outside input. Members come out
  // sorted by name. A document of another shape gives text that SQLite refuses.

  /// " (a, b) VALUES('1', NULL)". A null is NULL, or the current time in
  /// seconds under the name "timestamp".
  std::string GetInsertParam(const Json::Value& row);

  /// "a='1'<separator>b='2'"; a null value is the empty text.
  std::string ConcateParam(const Json::Value& pairs, const std::string& separator);

  /// " WHERE a='1' and b='2'", or nothing for an empty condition.
  std::string GetConditionParam(const Json::Value& condition);

  /// " SET a='1', b='2'" from `modified`, then the clause of `condition`.
  std::string GetUpdateParam(const Json::Value& request);

  // Rows --------------------------------------------------------------------
  //
  // A request is a JSON object with "condition" (an object: every member must
  // equal), and where it applies "modified" (an object), "condition_like" and
  // "option" (raw SQL texts). "client_id" and "client_secret" are encrypted in
  // place, so the caller's document holds ciphertext afterwards. A document of
  // another shape is refused before anything else: false, -2 "Bad parameters".
  // A failed encryption runs no statement: false, -4 "Data Encrypt failed".
  // A failed statement: false, SQLite's code and text.

  /// Inserts `row`, whose members are columns. True when the INSERT ran.
  bool DBAdd(Json::Value& row);

  /// Makes `*result` an array with one object per selected row, every value a
  /// text, secrets decrypted. True when the SELECT ran, also without a row.
  /// "condition_like" replaces "condition"; "option" ends the statement.
  /// After a failed SELECT `*result` holds the rows read before.
  /// Note: a failed encryption says -4 "Data Decrypt failed" here and leaves
  /// `*result` untouched. Null `result`: false, -2 "Bad parameters".
  bool DBGet(Json::Value& request, Json::Value* result);

  /// Sets the columns of "modified" in every row that meets "condition", in
  /// all rows without one. True when at least one row changed.
  /// Note: no row changed is false without an error code.
  bool DBEdit(Json::Value& request);

  /// Deletes every row that meets "condition", all rows without one. True when
  /// at least one row went. Note: no row is false without an error code.
  bool DBDel(Json::Value& request);

  // Encryption --------------------------------------------------------------

  /// Encrypts the members "client_id" and then "client_secret" of `doc` in
  /// place. 1 when all that are present succeeded; 0 at the first failure,
  /// which leaves the rest as it was.
  static int ParamEncrypt(Json::Value& doc);
  /// The inverse.
  static int ParamDecrypt(Json::Value& doc);

 protected:
  /// For the stores' second constructors: an object on the connection of
  /// `store`, as if it were one with it. Opens and creates nothing, switches no
  /// privilege and closes nothing; it is ready if `store` is at this moment,
  /// and has an error state of its own. `store` must outlive it.
  OAUTHDBBasic(const std::string& tableName, OAUTHDBBasic& store);

  /// True on the connection of another object.
  bool IsLent() const;

  /// Records `error` and returns false, for the stores' one-line refusals.
  bool Fail(const OAUTHError& error);

  /// To be called in a catch block that ends a public operation: records what
  /// was thrown, logs it under `source` and `line`, and returns false.
  bool FailUnexpectedly(const char* source, int line) noexcept;

 private:
  friend class Transaction;

  // The bodies of the public operations that start-up must see fail: they
  // throw.
  int Run(const std::string& sql, RowCallback callback, Json::Value* arg);
  int Execute(const std::string& sql, RowCallback callback, Json::Value* arg);  // without a trace
  int FindTable(const std::string& name);
  void InsertMetaRows();

  void Open();
  bool RunChange(const std::string& sql, int& changed);

  int errCode_;
  int ready_ = 0;
  std::string errMsg_;
  std::string tabName_;
  sqlite3* db_ = nullptr;
  OAUTHDBBasic* lender_ = nullptr;  // whose connection this is; null for one's own
};

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_CORE_OAUTH_DB_BASIC_H
