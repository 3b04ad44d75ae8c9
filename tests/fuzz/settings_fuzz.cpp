// Any bytes as the settings file.

#include <fcntl.h>
#include <json/reader.h>
#include <json/value.h>
#include <unistd.h>

#include <algorithm>
#include <cstdint>
#include <sstream>
#include <string>
#include <thread>

#include "tests/fuzz/expect.h"
#include "tests/support/private_mounts.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace {

namespace names = KELDOAUTHSERVER::names;
using fuzz::expect;

constexpr std::size_t kMostBytes = 65536;

void writeSettings(const std::uint8_t* data, std::size_t size) {
  const int file = open(names::kSettingsFile, O_WRONLY | O_CREAT | O_TRUNC, 0600);
  expect(write(file, data, size) == static_cast<ssize_t>(size), "writing the settings");
  close(file);
}

/// 0 for whatever is no 32-bit integer under `key`.
int numberIn(const Json::Value& settings, const char* key) {
  if (!settings.isObject() || !settings[key].isInt()) return 0;
  return settings[key].asInt();
}

Json::Value parsed(const std::string& text) {
  Json::Value settings;
  std::istringstream stream(text);
  try {
    if (parseFromStream(Json::CharReaderBuilder(), stream, &settings, nullptr)) return settings;
  } catch (const Json::Exception&) {
    // nested too deep
  }
  return {};
}

/// Each thread looks up its level once.
int levelOfANewThread() {
  int level = 0;
  std::thread([&level] { level = KELDOAUTHSERVER::getLogLevel(); }).join();
  return level;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const bool isSafe = (support::requirePrivateMounts(), true);
  expect(isSafe, "private mounts");
  writeSettings(data, size);
  const bool isRead = size <= kMostBytes;
  const Json::Value settings = parsed({reinterpret_cast<const char*>(data), isRead ? size : 0});

  for (const char* key : {names::kGrantCodeExpired, names::kTokenExpired}) {
    const int wanted = numberIn(settings, key) > 0 ? numberIn(settings, key) : 600;
    expect(KELDOAUTHSERVER::getExpiredPeriod(key) == wanted, "a lifetime", key);
  }
  for (const char* key :
       {names::kClientInfoMax, names::kGrantCodeMax, names::kTokenMax, names::kLogMax}) {
    const int wanted = numberIn(settings, key) > 0 ? numberIn(settings, key) : 1000;
    expect(KELDOAUTHSERVER::getTableRowMax(key) == std::min(wanted, 10000), "a maximum", key);
  }
  // A thread is dear, and that 0 stands for whatever is no number the others show.
  if (numberIn(settings, names::kLogLevel) == 0) return 0;
  expect(levelOfANewThread() == numberIn(settings, names::kLogLevel), "the log level");
  return 0;
}
