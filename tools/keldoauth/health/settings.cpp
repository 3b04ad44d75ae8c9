// The settings file as it is written, beside what the library reads from it.
// The library replaces what it cannot use by a default and says nothing.

#include <json/reader.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <exception>
#include <fstream>
#include <memory>
#include <sstream>
#include <string>

#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/health/health.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

constexpr char kSubject[] = "settings";

/// A key and what the library makes of its value.
struct Setting {
  const char* key;
  int (*inEffect)(const std::string& key);
};

int logLevel(const std::string& /*key*/) {
  return getLogLevel();
}

constexpr Setting kSettings[] = {
    {names::kGrantCodeExpired, getExpiredPeriod},
    {names::kTokenExpired, getExpiredPeriod},
    {names::kClientInfoMax, getTableRowMax},
    {names::kGrantCodeMax, getTableRowMax},
    {names::kTokenMax, getTableRowMax},
    {names::kLogMax, getTableRowMax},
    {names::kLogLevel, logLevel},
};

bool isKnown(const std::string& key) {
  return std::any_of(std::begin(kSettings), std::end(kSettings),
                     [&key](const Setting& setting) { return key == setting.key; });
}

/// The file's value as a short text for people.
std::string written(const Json::Value& value) {
  if (value.isArray()) return "a list";
  if (value.isObject()) return "an object";
  if (value.isNull()) return "null";
  if (value.isString()) return "\"" + fitted(printable(value.asString()), 40) + "\"";
  return value.asString();
}

void checkValue(const Setting& setting, const Json::Value& value, Problems& problems) {
  const std::string key = setting.key;
  const std::string effect = std::to_string(setting.inEffect(key));
  if (!value.isInt()) {
    problems.add(kSubject, key + ": " + written(value) + " is not a 32-bit integer",
                 effect + " applies");
  } else if (value.asInt() != setting.inEffect(key)) {
    problems.add(kSubject, key + ": " + written(value) + " is out of range", effect + " applies");
  }
}

void checkObject(const Json::Value& root, Problems& problems) {
  for (const std::string& key : root.getMemberNames()) {
    if (!isKnown(key)) problems.add(kSubject, "unknown key " + fitted(printable(key), 40));
  }
  for (const Setting& setting : kSettings) {
    if (root.isMember(setting.key)) checkValue(setting, root[setting.key], problems);
  }
}

/// "* Line 2, Column 1\n  Missing ...\n" on one line.
std::string onOneLine(const std::string& errors) {
  std::istringstream words(errors);
  std::string line;
  for (std::string word; words >> word;) {
    if (word != "*") line += (line.empty() ? "" : " ") + word;
  }
  return line;
}

/// Empty on success, otherwise what the parser objects to.
std::string parse(const std::string& text, Json::Value& root) try {
  const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
  std::string errors;
  return reader->parse(text.data(), text.data() + text.size(), &root, &errors) ? std::string()
                                                                               : onOneLine(errors);
} catch (const std::exception& error) {
  return error.what();
}

}  // namespace

void inspectSettings(Problems& problems) {
  const char* const kDefaultsApply = "the defaults apply";
  struct stat status {};
  const bool isThere = stat(names::kSettingsFile, &status) == 0;
  if (!isThere && (errno == ENOENT || errno == ENOTDIR)) return;
  if (isThere && !S_ISREG(status.st_mode)) {
    problems.add(kSubject, "is not a regular file", kDefaultsApply);
    return;
  }
  std::ifstream file(names::kSettingsFile, std::ios::binary);
  if (!file) {
    problems.add(kSubject, "cannot be read: " + std::string(std::strerror(errno)), kDefaultsApply);
    return;
  }
  const std::string text{std::istreambuf_iterator<char>(file), {}};
  Json::Value root;
  const std::string error = parse(text, root);
  if (!error.empty()) {
    problems.add(kSubject, "is not JSON: " + printable(error), kDefaultsApply);
  } else if (!root.isObject()) {
    problems.add(kSubject, "is not a JSON object", kDefaultsApply);
  } else {
    checkObject(root, problems);
  }
}

}  // namespace tool
