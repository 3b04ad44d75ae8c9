#include "service/settings/settings.h"

#include <json/reader.h>
#include <json/value.h>
#include <sys/stat.h>

#include <algorithm>
#include <memory>
#include <string_view>
#include <utility>

#include "service/http/web_address.h"
#include "service/settings/keys.h"
#include "service/settings/private_text.h"
#include "service/text/encoding.h"
#include "utils/oauth_bounds.h"

namespace keldoauth::service {
namespace {

using Faults = std::vector<std::string>;
namespace bounds = KELDOAUTHSERVER::bounds;

constexpr std::size_t kMaxFile = std::size_t{256} * 1024;
constexpr std::size_t kMaxIssuer = 1024;
constexpr std::size_t kMaxScopes = 100;
constexpr std::size_t kMaxScopeName = 64;
constexpr std::size_t kMaxScopeWords = 200;
constexpr std::size_t kLeastToken = 32;
constexpr std::size_t kMostToken = 256;
constexpr int kMostHours = 8760;
constexpr char kKeysName[] = "service.keys.json";
constexpr char kCountersFile[] = "/var/lib/keldoauth/counters";
constexpr char kSigningKeysName[] = "signing.keys.json";

// Texts -------------------------------------------------------------------------

/// For people: UTF-8 without control characters, and not blank.
bool isShowable(const std::string& text) {
  return text.find_first_not_of(' ') != std::string::npos && isUtf8(text) &&
         std::none_of(text.begin(), text.end(), isControl);
}

/// RFC 6749, 3.3.
bool isScopeName(const std::string& text) {
  const auto isAllowed = [](char c) { return c > ' ' && c < '\x7f' && c != '"' && c != '\\'; };
  return !text.empty() && text.size() <= kMaxScopeName &&
         std::all_of(text.begin(), text.end(), isAllowed);
}

/// The characters of a bearer token (RFC 6750, 2.1).
bool isToken(const std::string& text) {
  return text.size() >= kLeastToken && text.size() <= kMostToken &&
         std::all_of(text.begin(), text.end(), [](char c) {
           constexpr std::string_view kOthers = "-._~+/=";
           const char small = lowerCase(c);
           return (small >= 'a' && small <= 'z') || (c >= '0' && c <= '9') ||
                  kOthers.find(c) != std::string_view::npos;
         });
}

bool isAbsolutePath(const std::string& text) {
  return text.size() > 1 && text.front() == '/' && text.find('\0') == std::string::npos;
}

/// A path by which pages can link to each other.
bool isBasePath(const std::string& path) {
  if (path.empty()) return true;
  return path.back() != '/' && (path + "/").find("/./") == std::string::npos &&
         (path + "/").find("/../") == std::string::npos && path.find("//") == std::string::npos;
}

// Keys --------------------------------------------------------------------------

void readIssuer(const Json::Value& value, Settings& settings, Faults& faults) {
  const std::string text = value.isString() ? value.asString() : "";
  const auto address = readWebAddress(text);
  if (!address || text.size() > kMaxIssuer || !isBasePath(address->path)) {
    faults.emplace_back(
        "issuer must be an address like https://box.example or https://box.example/path, in small "
        "letters, without a slash at the end, a query or a fragment");
    return;
  }
  if (!address->isSecure && !isLoopbackHost(address->host)) {
    faults.emplace_back("issuer must begin with https://; http is for 127.0.0.1 and localhost");
  }
  settings.issuer = text;
  settings.basePath = address->path;
}

void readAdministrators(const Json::Value& value, Settings& settings, Faults& faults) {
  const auto isUser = [](const Json::Value& name) {
    return name.isString() && name.asString().size() <= bounds::kUsername.max &&
           isShowable(name.asString());
  };
  if (!value.isArray() || !std::all_of(value.begin(), value.end(), isUser)) {
    faults.emplace_back("administrators must be a list of user names");
    return;
  }
  for (const Json::Value& name : value) settings.administrators.insert(name.asString());
}

void readScopes(const Json::Value& value, Settings& settings, Faults& faults) {
  if (!value.isObject() || value.empty() || value.size() > kMaxScopes) {
    faults.emplace_back("scopes must be an object of names and words, 1 to 100 of them");
    return;
  }
  std::vector<KnownScope> scopes;
  for (const std::string& name : value.getMemberNames()) {
    const Json::Value& words = value[name];
    if (!isScopeName(name)) {
      faults.emplace_back("scopes: a name is 1 to 64 characters without blanks, quotes and \\");
    } else if (!words.isString() || words.asString().size() > kMaxScopeWords ||
               !isShowable(words.asString())) {
      faults.push_back("scopes: the words of " + name + " must be a text of 1 to 200 bytes");
    } else {
      scopes.push_back({name, words.asString()});
    }
  }
  settings.scopes = ScopeTable(std::move(scopes));
}

void readInitialToken(const Json::Value& value, Settings& settings, Faults& faults) {
  const bool isEmpty = value.isString() && value.asString().empty();
  if (!isEmpty && (!value.isString() || !isToken(value.asString()))) {
    faults.emplace_back(
        "initial_access_token must be \"\", or 32 to 256 letters, digits and -._~+/=");
    return;
  }
  settings.initialAccessToken = value.asString();
}

void readSignIn(const Json::Value& value, Settings& settings, Faults& faults) {
  if (value == "web-server") {
    settings.signIn = SignIn::kWebServer;
  } else if (value == "system") {
    settings.signIn = SignIn::kSystem;
  } else if (value == "htpasswd") {
    settings.signIn = SignIn::kHtpasswd;
  } else {
    faults.emplace_back(R"(sign_in must be "web-server", "system" or "htpasswd")");
  }
}

void readSessionHours(const Json::Value& value, Settings& settings, Faults& faults) {
  const bool isWhole = value.isInt() && value.asInt() >= 1 && value.asInt() <= kMostHours;
  if (!isWhole) {
    faults.emplace_back("session_hours must be a whole number from 1 to 8760");
    return;
  }
  settings.sessionSeconds = value.asInt() * 3600LL;
}

std::string readPath(const char* key, const Json::Value& value, Faults& faults) {
  if (value.isString() && isAbsolutePath(value.asString())) return value.asString();
  faults.push_back(std::string(key) + " must be a path that begins with a slash");
  return {};
}

void readHtpasswdFile(const Json::Value& value, Settings& settings, Faults& faults) {
  settings.htpasswdFile = readPath("htpasswd_file", value, faults);
}

void readKeysFile(const Json::Value& value, Settings& settings, Faults& faults) {
  settings.keysFile = readPath("keys_file", value, faults);
}

void readCountersFile(const Json::Value& value, Settings& settings, Faults& faults) {
  const bool isNone = value.isString() && value.asString().empty();
  settings.countersFile = isNone ? "" : readPath("counters_file", value, faults);
}

void readSigningKeysFile(const Json::Value& value, Settings& settings, Faults& faults) {
  settings.signingKeysFile = readPath("signing_keys_file", value, faults);
}

constexpr struct {
  std::string_view name;
  void (*read)(const Json::Value& value, Settings& settings, Faults& faults);
} kKeys[] = {{"issuer", readIssuer},
             {"administrators", readAdministrators},
             {"scopes", readScopes},
             {"initial_access_token", readInitialToken},
             {"sign_in", readSignIn},
             {"htpasswd_file", readHtpasswdFile},
             {"session_hours", readSessionHours},
             {"keys_file", readKeysFile},
             {"counters_file", readCountersFile},
             {"signing_keys_file", readSigningKeysFile}};

// The file ----------------------------------------------------------------------

/// What a key that is there reads as; keys that nobody knows are faults.
void readMembers(const Json::Value& document, Settings& settings, Faults& faults) {
  for (const std::string& name : document.getMemberNames()) {
    const auto* const key = std::find_if(std::begin(kKeys), std::end(kKeys),
                                         [&](const auto& known) { return known.name == name; });
    if (key == std::end(kKeys)) {
      faults.push_back(isScopeName(name) ? "unknown key: " + name : "unknown key");
    } else {
      key->read(document[name], settings, faults);
    }
  }
}

/// The scopes that every box has something for: who somebody is.
ScopeTable usualScopes() {
  return ScopeTable(
      std::vector<KnownScope>{{"openid", "Know that it is you"},
                              {"profile", "See who you are: your user name on this box"}});
}

std::string besides(const std::string& path, const char* name) {
  const std::size_t slash = path.rfind('/');
  return (slash == std::string::npos ? "" : path.substr(0, slash + 1)) + name;
}

}  // namespace

SettingsFault::SettingsFault(std::vector<std::string> faults)
    : std::runtime_error(faults.empty() ? "" : faults.front()), faults_(std::move(faults)) {}

Settings parseSettings(const std::string& text, const std::string& path) {
  const Json::Value document = parseJsonObject(text, path);
  Settings settings;
  settings.scopes = usualScopes();
  settings.keysFile = besides(path, kKeysName);
  settings.countersFile = kCountersFile;
  settings.signingKeysFile = besides(path, kSigningKeysName);
  Faults faults;
  readMembers(document, settings, faults);
  if (!document.isMember("issuer")) faults.emplace_back("issuer is missing");
  if (settings.signIn == SignIn::kHtpasswd && !document.isMember("htpasswd_file")) {
    faults.emplace_back("htpasswd_file is missing, which sign_in \"htpasswd\" needs");
  }
  if (!faults.empty()) {
    for (std::string& fault : faults) fault.insert(0, path + ": ");
    throw SettingsFault(std::move(faults));
  }
  return settings;
}

Settings readSettingsWithoutKeys(const std::string& path) {
  const TextFile file = readTextFile(path, kMaxFile);
  Settings settings = parseSettings(file.text, path);
  if (file.isOpenToAll && !settings.initialAccessToken.empty()) {
    throw SettingsFault({path + ": everybody can read it, and with it initial_access_token"});
  }
  return settings;
}

Settings readSettings(const std::string& path) {
  Settings settings = readSettingsWithoutKeys(path);
  const Keys keys = readKeys(settings.keysFile);
  settings.formKey = keys.form;
  settings.sessionKey = keys.session;
  return settings;
}

}  // namespace keldoauth::service
