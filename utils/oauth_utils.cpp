#include "utils/oauth_utils.h"

#include <fcntl.h>
#include <json/reader.h>
#include <json/value.h>
#include <unistd.h>

#include <array>
#include <cstddef>
#include <cstring>
#include <exception>
#include <memory>
#include <string>

#include "platform/keldcgi.h"
#include "utils/diagnostics.h"
#include "utils/file.h"
#include "utils/oauth_names.h"
#include "utils/sql_text.h"
#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {
namespace {

constexpr char kSource[] = "oauth_utils";

/// The numbers that this source's lines carry.
enum Line : int {
  kNoSqlTextLine = 101,
  kCheckStrLenLine = 102,
};

constexpr int kDefaultPeriodSeconds = 600;
constexpr int kDefaultRowMax = 1000;
constexpr int kHighestRowMax = 10000;

constexpr int kNotLookedUp = -1;
thread_local int debugFlag = kNotLookedUp;
thread_local int logLevel = kNotLookedUp;

constexpr std::size_t kAddressBytes = 1024;

// Settings ------------------------------------------------------------------

constexpr std::size_t kMostSettingsBytes = 65536;

/// False for what is not a regular file, and for one that is longer or grows
/// beyond that. O_NONBLOCK: whatever stands in the file's place must not keep a
/// request waiting.
bool readSettingsFile(std::string& text) {
  const File file(names::kSettingsFile, O_RDONLY | O_NONBLOCK | O_NOCTTY);
  if (!file.isOpen() || !file.isRegular()) return false;

  std::array<char, 4096> buffer;
  for (;;) {
    const ssize_t got = file.readSome(buffer.data(), buffer.size());
    if (got < 0) return false;
    if (got == 0) return true;
    text.append(buffer.data(), static_cast<std::size_t>(got));
    if (text.size() > kMostSettingsBytes) return false;
  }
}

/// The parser leaves a half-filled root behind when it fails, hence the bool.
bool loadSettings(Json::Value& root) {
  std::string text;
  if (!readSettingsFile(text)) return false;

  // Its own settings are a document that takes as long to make as ours to parse.
  // It is never changed, and never destroyed: a process may still end in another
  // thread.
  static const auto& builder = *new Json::CharReaderBuilder;
  const std::unique_ptr<Json::CharReader> parser(builder.newCharReader());
  return parser->parse(text.data(), text.data() + text.size(), &root, nullptr);
}

/// 0 for everything that is not a 32-bit integer under `key` of an object.
int readSettingInt(const std::string& key) {
  try {
    Json::Value root;
    if (!loadSettings(root) || !root.isObject() || !root.isMember(key)) return 0;

    const Json::Value& value = root[key];
    return value.isInt() ? value.asInt() : 0;
  } catch (const std::exception&) {
    // Nesting beyond what the parser takes, or no memory: the key is absent.
    return 0;
  }
}

// SQL text ------------------------------------------------------------------

void logNoSqlFormat() {
  syslog(LOG_ERR, "%s:%d Can't transfer to SQL format", kSource, kNoSqlTextLine);
}

std::string copyFormatted(const SqliteText& text) {
  if (text == nullptr) {
    logNoSqlFormat();
    return {};
  }
  return text.get();
}

}  // namespace

// Settings ------------------------------------------------------------------

int getExpiredPeriod(const std::string& key) {
  const int seconds = readSettingInt(key);
  return seconds <= 0 ? kDefaultPeriodSeconds : seconds;
}

int getTableRowMax(const std::string& key) {
  const int rows = readSettingInt(key);
  if (rows <= 0) return kDefaultRowMax;
  return rows >= kHighestRowMax ? kHighestRowMax : rows;
}

// Diagnostics ---------------------------------------------------------------

bool isDebugEnabled() {
  if (debugFlag == kNotLookedUp) {
    debugFlag = access(names::kDebugFlagFile, R_OK) == 0 ? 1 : 0;
  }
  return debugFlag == 1;
}

int getLogLevel() {
  if (logLevel == kNotLookedUp) {
    logLevel = readSettingInt(names::kLogLevel);
  }
  return logLevel;
}

// SQL text ------------------------------------------------------------------

std::string quoteSql(const std::string& value) {
  return copyFormatted(SqliteText(sqlite3_mprintf("%q", value.c_str())));
}

std::string likeSql(const std::string& column, const std::string& value) {
  return copyFormatted(
      SqliteText(sqlite3_mprintf("%s like '%%%q%%'", column.c_str(), value.c_str())));
}

std::string getSQLFormatStr(const std::string& value) try {
  return quoteSql(value);
} catch (const std::exception&) {
  logNoSqlFormat();
  return {};
}

std::string getSQLFormatLikeStr(const std::string& column, const std::string& value) try {
  return likeSql(column, value);
} catch (const std::exception&) {
  logNoSqlFormat();
  return {};
}

// Requests ------------------------------------------------------------------

bool checkStrLen(const std::string& str, int min, int max, bool allowEmpty) {
  if (isTraced(kLengthCheck)) {
    syslog(LOG_ERR, "%s:%d %s[%s]", kSource, kCheckStrLenLine, __func__, str.c_str());
  }
  const int length = static_cast<int>(str.size());
  if (allowEmpty && length == 0) return true;
  return min <= length && length <= max;
}

std::string getRemoteIP() try {
  std::array<char, kAddressBytes> address{};
  if (KeldCgiGetRemoteIP(address.data(), address.size()) != 0) return {};
  return {address.data(), strnlen(address.data(), address.size())};
} catch (const std::exception&) {
  return {};
}

}  // namespace KELDOAUTHSERVER
