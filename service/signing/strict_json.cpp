#include "service/signing/strict_json.h"

#include <json/reader.h>
#include <json/writer.h>

#include <exception>
#include <memory>

namespace keldoauth::service::signing {
namespace {

constexpr int kDepth = 8;

}  // namespace

std::optional<Json::Value> readObject(std::string_view text) {
  Json::CharReaderBuilder builder;
  Json::CharReaderBuilder::strictMode(&builder.settings_);
  builder["stackLimit"] = kDepth;
  const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  Json::Value value;
  try {
    const bool isRead = reader->parse(text.data(), text.data() + text.size(), &value, nullptr);
    if (!isRead || !value.isObject()) return std::nullopt;
  } catch (const Json::Exception&) {  // too deep
    return std::nullopt;
  }
  return value;
}

std::string compactText(const Json::Value& value) {
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "";
  return Json::writeString(builder, value);
}

}  // namespace keldoauth::service::signing
