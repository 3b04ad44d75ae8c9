#include "service/settings/keys.h"

#include <json/value.h>

#include <vector>

#include "service/settings/private_text.h"
#include "service/settings/settings.h"
#include "utils/oauth_utils.h"

namespace keldoauth::service {
namespace {

constexpr std::size_t kMaxFile = 4096;
constexpr std::size_t kLeastBytes = 32;
constexpr unsigned kDrawnCharacters = 64;  // of a hexadecimal digit each
constexpr char kFormKey[] = "form_key";
constexpr char kSessionKey[] = "session_key";

}  // namespace

Keys readKeys(const std::string& path) {
  const TextFile file = readTextFile(path, kMaxFile);
  if (file.isOpenToAll) throw SettingsFault({path + ": everybody can read it"});
  const Json::Value document = parseJsonObject(file.text, path);
  std::vector<std::string> faults;
  for (const char* name : {kFormKey, kSessionKey}) {
    const Json::Value& key = document[name];
    if (!key.isString() || key.asString().size() < kLeastBytes) {
      faults.push_back(path + ": " + name + " must be a text of at least 32 characters");
    }
  }
  for (const std::string& name : document.getMemberNames()) {
    if (name != kFormKey && name != kSessionKey) faults.push_back(path + ": unknown key");
  }
  if (!faults.empty()) throw SettingsFault(std::move(faults));
  return {document[kFormKey].asString(), document[kSessionKey].asString()};
}

void makeKeys(const std::string& path) {
  const auto draw = [] { return KELDOAUTHSERVER::getRandomStr(kDrawnCharacters); };
  makePrivateFile(
      path, "{\n  \"form_key\": \"" + draw() + "\",\n  \"session_key\": \"" + draw() + "\"\n}\n");
}

}  // namespace keldoauth::service
