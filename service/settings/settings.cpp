#include "service/settings/settings.h"

#include <json/reader.h>
#include <json/value.h>

#include <algorithm>
#include <fstream>
#include <stdexcept>
#include <utility>
#include <vector>

namespace keldoauth::service {
namespace {

constexpr std::size_t kLeastKeyBytes = 32;

std::string pathOf(const std::string& issuer) {
  const std::size_t host = issuer.find("://");
  if (host == std::string::npos) throw std::runtime_error("issuer is no address");
  return issuer.substr(std::min(issuer.find('/', host + 3), issuer.size()));
}

ScopeTable readScopes(const Json::Value& words) {
  std::vector<KnownScope> scopes;
  for (const std::string& name : words.getMemberNames()) {
    scopes.push_back({name, words[name].asString()});
  }
  return ScopeTable(std::move(scopes));
}

}  // namespace

Settings readSettings(const std::string& path) {
  std::ifstream file(path);
  const Json::CharReaderBuilder reader;
  Json::Value document;
  if (!file || !Json::parseFromStream(reader, file, &document, nullptr) || !document.isObject()) {
    throw std::runtime_error("no settings");
  }
  Settings settings;
  settings.issuer = document["issuer"].asString();
  settings.basePath = pathOf(settings.issuer);
  settings.initialAccessToken = document["initial_access_token"].asString();
  settings.formKey = document["form_key"].asString();
  for (const Json::Value& name : document["administrators"]) {
    settings.administrators.insert(name.asString());
  }
  settings.scopes = readScopes(document["scopes"]);
  if (settings.formKey.size() < kLeastKeyBytes) throw std::runtime_error("form_key is too short");
  return settings;
}

}  // namespace keldoauth::service
