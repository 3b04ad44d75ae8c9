// The numbers of the core's log lines. All of them are written under the source
// name "oauth_db_basic", whichever file of this folder writes them, so that they
// stand in one table: no number twice, and none ever moves, because readers of
// the log match on them. The stores have such tables at their own heads.

#ifndef KELDOAUTH_CORE_LOG_LINES_H
#define KELDOAUTH_CORE_LOG_LINES_H

namespace KELDOAUTHSERVER::line {

inline constexpr char kSource[] = "oauth_db_basic";

/// "Entry" is the trace that an operation writes when it is called, "Threw" its
/// "Unexpected failure".
enum CoreLine : int {
  // oauth_db_basic.cpp: opening and closing
  kOpenFailed = 101,
  kOpenThrew = 102,
  kCloseFailed = 103,

  // oauth_db_basic.cpp: the object
  kSetErrMsgThrew = 121,
  kSetTabNameThrew = 122,

  // oauth_db_basic.cpp: running statements
  kDBCmdEntry = 141,
  kNotReady = 142,
  kDBCmdRunEntry = 143,
  kRunCommandFailed = 144,
  kDBCmdRunThrew = 145,

  // row_callbacks.cpp
  kTabCountEntry = 151,
  kTabCountThrew = 152,
  kIsTabExistEntry = 153,
  kIsTabExistDump = 154,
  kIsTabExistThrew = 155,
  kTabGetEntry = 156,
  kTabGetDump = 157,
  kDecryptDataFailed = 158,
  kTabGetThrew = 159,

  // oauth_db_basic.cpp: schema
  kInitMetaEntry = 201,
  kCreateMetaFailed = 202,
  kInitClientEntry = 203,
  kCreateClientFailed = 204,
  kInitTokenEntry = 205,
  kCreateTokenFailed = 206,
  kInitGrantCodeEntry = 207,
  kCreateGrantCodeFailed = 208,
  kInitLogEntry = 209,
  kCreateLogFailed = 210,
  kDBInitThrew = 211,
  kAddMetaDataEntry = 221,
  kAddMetaFailed = 222,
  kAddMetaDataThrew = 223,
  kCreateTabSuccess = 231,
  kCreateDBTabThrew = 232,
  kTabIsExist = 241,
  kIsDBTabExistThrew = 242,
  kRowCountEntry = 251,
  kRowCountFailed = 252,
  kRowCountThrew = 253,
  kCheckRowMaxEntry = 261,
  kCheckRowMaxFailed = 262,
  kTableRowCount = 263,
  kCheckRowMaxThrew = 264,
  kDropEntry = 271,
  kDropFailed = 272,
  kDropThrew = 273,

  // clauses.cpp
  kInsertParamEntry = 301,
  kConcateParamEntry = 302,
  kConditionParamEntry = 303,
  kUpdateParamEntry = 304,

  // oauth_db_basic.cpp: request documents to SQL
  kInsertParamThrew = 311,
  kConcateParamThrew = 312,
  kConditionParamThrew = 313,
  kUpdateParamThrew = 314,

  // oauth_db_basic.cpp: rows
  kAddEntry = 401,
  kAddFailed = 402,
  kAddSuccess = 403,
  kAddThrew = 404,
  kGetEntry = 411,
  kGetFailed = 412,
  kGetDone = 413,
  kGetThrew = 414,
  kEditEntry = 421,
  kEditFailed = 422,
  kEditSuccess = 423,
  kEditThrew = 424,
  kDelEntry = 431,
  kDelFailed = 432,
  kDelSuccess = 433,
  kDelThrew = 434,

  // secrets.cpp
  kEncryptClientIdEntry = 501,
  kEncryptClientSecretEntry = 502,
  kDecryptClientIdEntry = 503,
  kDecryptClientSecretEntry = 504,
  kEncryptFailed = 505,
  kDecryptFailed = 506,

  // oauth_db_basic.cpp: encryption
  kParamEncryptThrew = 511,
  kParamDecryptThrew = 512,

  // privilege.cpp
  kSetIdsDone = 601,
  kSetIdsFailed = 602,
  kEnterFailed = 603,
  kLeaveFailed = 604,
};

}  // namespace KELDOAUTHSERVER::line

#endif  // KELDOAUTH_CORE_LOG_LINES_H
