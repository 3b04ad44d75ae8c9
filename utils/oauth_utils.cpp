#include "utils/oauth_utils.h"

#include <fcntl.h>
#include <json/reader.h>
#include <json/value.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <exception>
#include <memory>
#include <random>
#include <string>
#include <system_error>

#include "platform/keldcgi.h"
#include "utils/diagnostics.h"
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

/// An open file that closes itself.
class File {
 public:
  File(const char* path, int flags) : descriptor_(open(path, flags | O_CLOEXEC)) {}
  ~File() {
    if (isOpen()) close(descriptor_);
  }
  File(const File&) = delete;
  File& operator=(const File&) = delete;

  [[nodiscard]] bool isOpen() const { return descriptor_ >= 0; }

  [[nodiscard]] bool isRegular() const {
    struct stat file {};
    return fstat(descriptor_, &file) == 0 && S_ISREG(file.st_mode);
  }

  /// One read, taken up again when a signal interrupts it.
  ssize_t readSome(char* buffer, std::size_t size) const {
    ssize_t got = 0;
    do {
      got = read(descriptor_, buffer, size);
    } while (got < 0 && errno == EINTR);
    return got;
  }

 private:
  int descriptor_;
};

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

  const std::unique_ptr<Json::CharReader> parser(Json::CharReaderBuilder().newCharReader());
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

// Random text ---------------------------------------------------------------

constexpr std::size_t kUuidBytes = 16;

[[noreturn]] void throwNoRandomness(int error) {
  throw std::system_error(error, std::generic_category(), "system random source");
}

/// One call to the kernel; where it is not to be had, there is the device.
void fillFromSystem(char* out, std::size_t size) {
  for (std::size_t filled = 0; filled < size;) {
    ssize_t got = getrandom(out + filled, size - filled, 0);
    if (got < 0 && (errno == ENOSYS || errno == EPERM)) {
      const File device("/dev/urandom", O_RDONLY);
      if (!device.isOpen()) throwNoRandomness(errno);
      got = device.readSome(out + filled, size - filled);
    }
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) throwNoRandomness(errno);
    if (got == 0) throwNoRandomness(EIO);
    filled += static_cast<std::size_t>(got);
  }
}

/// Seeds every word of a generator's state from the system.
struct SystemSeed {
  using result_type = std::uint_least32_t;

  void generate(result_type* first, result_type* last) const {
    fillFromSystem(reinterpret_cast<char*>(first),
                   static_cast<std::size_t>(last - first) * sizeof(result_type));
  }
};

std::array<std::uint8_t, kUuidBytes> drawUuid() {
  SystemSeed seed;
  std::mt19937 generator(seed);

  std::array<std::uint8_t, kUuidBytes> uuid{};
  for (std::size_t i = 0; i < uuid.size(); i += 4) {
    const std::uint_fast32_t word = generator();
    for (std::size_t byte = 0; byte < 4; ++byte) {
      uuid[i + byte] = static_cast<std::uint8_t>(word >> (8 * byte));
    }
  }
  uuid[8] = static_cast<std::uint8_t>((uuid[8] & 0xBFU) | 0x80U);  // variant of RFC 4122
  uuid[6] = static_cast<std::uint8_t>((uuid[6] & 0x4FU) | 0x40U);  // version 4
  return uuid;
}

void appendHex(std::string& text, std::uint8_t byte) {
  constexpr char kDigits[] = "0123456789abcdef";
  text += kDigits[byte >> 4U];
  text += kDigits[byte & 0x0FU];
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

std::string getRandomStr(unsigned int length) {
  std::string text;
  while (text.size() < length) {
    for (const std::uint8_t byte : drawUuid()) appendHex(text, byte);
  }
  return text;
}

}  // namespace KELDOAUTHSERVER
