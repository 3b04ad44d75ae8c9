// Every path and every name that two sources must agree on: files on disk,
// settings keys, tables, columns and the keys of request documents. No such
// literal stands anywhere else.

#ifndef KELDOAUTH_UTILS_OAUTH_NAMES_H
#define KELDOAUTH_UTILS_OAUTH_NAMES_H

namespace KELDOAUTHSERVER::names {

// Files.
inline constexpr char kDatabaseFile[] = "/var/packages/Corvane/target/etc/oauth.db";
inline constexpr char kSettingsFile[] = "/var/packages/Corvane/target/etc/oauth.cfg";
inline constexpr char kDebugFlagFile[] = "/tmp/keldoauth_debug";

// Keys of the settings file; each holds a JSON integer.
inline constexpr char kGrantCodeExpired[] = "grantcode_expired";  // seconds
inline constexpr char kTokenExpired[] = "token_expired";          // seconds
inline constexpr char kClientInfoMax[] = "client_info_max";       // rows
inline constexpr char kGrantCodeMax[] = "grantcode_max";          // rows
inline constexpr char kTokenMax[] = "token_max";                  // rows
inline constexpr char kLogMax[] = "log_max";                      // rows
inline constexpr char kLogLevel[] = "log_level";                  // bit mask

// Tables; callers hand the last four to the constructor of the matching store.
inline constexpr char kMetaTable[] = "oauth_meta";
inline constexpr char kClientInfoTable[] = "oauth_clientInfo";
inline constexpr char kGrantCodeTable[] = "oauth_grantCode";
inline constexpr char kTokenTable[] = "oauth_token";
inline constexpr char kLogTable[] = "oauth_log";

// Columns. Result rows use them as member names.
inline constexpr char kAccessToken[] = "access_token";
inline constexpr char kClientId[] = "client_id";
inline constexpr char kClientSecret[] = "client_secret";
inline constexpr char kCode[] = "code";
inline constexpr char kDisplayName[] = "display_name";
inline constexpr char kEnable[] = "enable";
inline constexpr char kExpiredTime[] = "expired_time";
inline constexpr char kFlowType[] = "flow_type";
inline constexpr char kId[] = "id";
inline constexpr char kIp[] = "ip";
inline constexpr char kMsg[] = "msg";
inline constexpr char kRedirectUri[] = "redirect_uri";
inline constexpr char kRefreshToken[] = "refresh_token";
inline constexpr char kScope[] = "scope";
inline constexpr char kState[] = "state";
inline constexpr char kTabName[] = "tab_name";
inline constexpr char kTimestamp[] = "timestamp";
inline constexpr char kUsername[] = "username";
inline constexpr char kVersion[] = "version";

// Keys of a request document.
inline constexpr char kCondition[] = "condition";
inline constexpr char kConditionLike[] = "condition_like";
inline constexpr char kModified[] = "modified";
inline constexpr char kOption[] = "option";

// Keys of result documents that are no columns.
inline constexpr char kErrCode[] = "err_code";
inline constexpr char kErrMsg[] = "err_msg";
inline constexpr char kExist[] = "exist";

}  // namespace KELDOAUTHSERVER::names

#endif  // KELDOAUTH_UTILS_OAUTH_NAMES_H
