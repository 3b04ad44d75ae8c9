// The catalogue of the library's own errors: the code and message that an
// object keeps (GetErrCode, GetErrMsg) after an operation failed. Any other
// positive code is SQLite's own result code with SQLite's text.

#ifndef KELDOAUTH_CORE_OAUTH_ERRORS_H
#define KELDOAUTH_CORE_OAUTH_ERRORS_H

namespace KELDOAUTHSERVER {

struct OAUTHError {
  int code;
  const char* message;
};

namespace errors {

/// Nothing has failed since the object was constructed.
inline constexpr OAUTHError kNone{255, ""};

/// SQLite's "database is locked": another process held the lock for the whole
/// wait. The one of SQLite's codes for which trying again is the answer.
inline constexpr int kBusy = 5;

/// The constructor could not open the database. The code kept is SQLite's.
inline constexpr char kOpenFailed[] = "Open DB failed!!";

/// A CREATE statement of the start-up failed: the object is not ready.
inline constexpr OAUTHError kCreateTableFailed{-1, "Create table failed"};

/// An argument out of its bounds, a result pointer that is null, or a document
/// of a shape that no store builds.
inline constexpr OAUTHError kBadParameters{-2, "Bad parameters"};

/// OAUTHDBToken::Verify only, and only in its result document.
inline constexpr OAUTHError kAccessTokenExpired{-3, "Access Token Expired"};

/// A value of "client_id" or "client_secret" could not be encrypted. DBGet,
/// which encrypts its condition, says "Decrypt" for the same failure.
inline constexpr OAUTHError kEncryptFailed{-4, "Data Encrypt failed"};
inline constexpr OAUTHError kDecryptFailed{-4, "Data Decrypt failed"};

/// The table holds as many rows as the settings allow, or the count failed.
inline constexpr OAUTHError kClientInfoFull{-5, "ClientInfo Table is full"};
inline constexpr OAUTHError kGrantCodeFull{-5, "GrantCode Table is full"};
inline constexpr OAUTHError kTokenFull{-5, "Token Table is full"};

}  // namespace errors
}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_CORE_OAUTH_ERRORS_H
