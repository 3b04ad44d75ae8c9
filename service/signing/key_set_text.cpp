// The key set as text: what stands in the file.

#include <json/writer.h>

#include <algorithm>
#include <iterator>
#include <limits>
#include <set>

#include "service/signing/key_fault.h"
#include "service/signing/key_set.h"
#include "service/signing/strict_json.h"

namespace keldoauth::service::signing {
namespace {

constexpr char kKeys[] = "keys";
constexpr char kMade[] = "made";
constexpr char kSignsFrom[] = "signs_from";

/// 9999-12-31: so that sums with it stay numbers.
constexpr Time kLastTime = 253402300799;

Time timeMember(const Json::Value& jwk, const char* name) {
  const Json::Value& member = jwk[name];
  // JsonCpp would take 1e3, too.
  const bool isWhole = member.type() == Json::intValue || member.type() == Json::uintValue;
  if (!isWhole || !member.isInt64()) throw KeyFault(std::string(name) + " is no number of seconds");
  const Time time = member.asInt64();
  if (time < 0 || time > kLastTime) throw KeyFault(std::string(name) + " is out of bounds");
  return time;
}

Json::Value jwkOf(const DatedKey& dated) {
  Json::Value jwk = dated.key.privateJwk();
  jwk[kMade] = Json::Int64(dated.made);
  jwk[kSignsFrom] = Json::Int64(dated.signsFrom);
  return jwk;
}

DatedKey readKey(const Json::Value& jwk) {
  if (!jwk.isObject()) throw KeyFault("is no object");
  DatedKey dated{Key::read(jwk), timeMember(jwk, kMade), timeMember(jwk, kSignsFrom)};
  // What it would be written as: a member too many shows, and so does a wrong
  // kid or use.
  const Json::Value expected = jwkOf(dated);
  for (const std::string& name : jwk.getMemberNames()) {
    if (!expected.isMember(name)) throw KeyFault("has a member too many");
  }
  for (const char* name : {"kid", "use"}) {
    if (jwk[name] != expected[name]) throw KeyFault(std::string(name) + " does not fit");
  }
  return dated;
}

}  // namespace

std::string KeySet::text() const {
  Json::Value set(Json::objectValue);
  for (const DatedKey& dated : keys_) set[kKeys].append(jwkOf(dated));
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "  ";
  return Json::writeString(builder, set) + '\n';
}

KeySet KeySet::read(std::string_view text) {
  if (text.size() > kMaxKeySetText) throw KeyFault("is too long");
  const std::optional<Json::Value> document = readObject(text);
  if (!document) throw KeyFault("is no JSON object");
  const Json::Value& list = (*document)[kKeys];
  if (document->size() != 1 || !list.isArray()) throw KeyFault("is no set of keys");
  if (list.size() > kMaxKeys) throw KeyFault("has too many keys");

  KeySet set;
  std::set<std::string> identifiers;
  for (Json::ArrayIndex i = 0; i < list.size(); ++i) {
    const std::string which = "key " + std::to_string(i + 1) + ": ";
    try {
      set.keys_.push_back(readKey(list[i]));
    } catch (const KeyFault& fault) {
      throw KeyFault(which + fault.what());
    }
    if (!identifiers.insert(set.keys_.back().key.identifier()).second) {
      throw KeyFault(which + "is there twice");
    }
  }
  set.sort();
  for (const Algorithm algorithm : kAlgorithms) {
    static_cast<void>(set.signingKey(algorithm, 0));
  }
  return set;
}

}  // namespace keldoauth::service::signing
