#include "examples/cgi/settings.h"

#include <json/reader.h>
#include <json/value.h>

#include <cstdlib>
#include <fstream>
#include <stdexcept>

namespace service {
namespace {

constexpr std::size_t kLeastKeyBytes = 32;

Settings readSettings() {
  const char* path = std::getenv("SERVICE_SETTINGS");
  std::ifstream file(path == nullptr ? "" : path);
  const Json::CharReaderBuilder reader;
  Json::Value document;
  if (!file || !Json::parseFromStream(reader, file, &document, nullptr) || !document.isObject()) {
    throw std::runtime_error("no settings");
  }
  Settings settings{document["issuer"].asString(),
                    document["initial_access_token"].asString(),
                    document["form_key"].asString(),
                    {}};
  for (const Json::Value& name : document["administrators"]) {
    settings.administrators.insert(name.asString());
  }
  if (settings.issuer.empty() || settings.formKey.size() < kLeastKeyBytes) {
    throw std::runtime_error("incomplete settings");
  }
  return settings;
}

}  // namespace

const Settings& settings() {
  static const Settings read = readSettings();
  return read;
}

}  // namespace service
