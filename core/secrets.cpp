#include "core/secrets.h"

#include <array>
#include <cstddef>
#include <cstring>
#include <string>

#include "platform/keldcore.h"
#include "utils/diagnostics.h"
#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER {
namespace {

constexpr std::size_t kCipherBytes = 1024;

using PlatformCipher = int (*)(const char*, char*, size_t);

bool convertText(PlatformCipher cipher, const std::string& in, std::string& out) {
  std::array<char, kCipherBytes> buffer{};
  if (cipher(in.c_str(), buffer.data(), buffer.size()) == 0) return false;
  out.assign(buffer.data(), strnlen(buffer.data(), buffer.size()));
  return true;
}

bool EncryptText(const char* source, const std::string& in, std::string& out) {
  if (convertText(KCORECryptSzEncrypt, in, out)) return true;
  syslog(LOG_ERR, "%s:%d Data Encrypt failed", source, __LINE__);
  return false;
}

bool DecryptText(const char* source, const std::string& in, std::string& out) {
  if (convertText(KCORECryptSzDecrypt, in, out)) return true;
  syslog(LOG_ERR, "%s:%d Data Decrypt failed", source, __LINE__);
  return false;
}

using Conversion = bool (*)(const char*, const std::string&, std::string&);

bool convertMember(const char* source, Conversion convert, Json::Value& value) {
  std::string text;
  if (!convert(source, value.asString(), text)) return false;
  value = text;
  return true;
}

bool convertSecrets(const char* source, Conversion convert, const char* operation,
                    Json::Value& doc) {
  if (!doc.isObject()) return true;

  if (doc.isMember(names::kClientId)) {
    if (isTraced(kStoreTrace)) {
      syslog(LOG_ERR, "%s:%d ==> %s[client_id]", source, __LINE__, operation);
    }
    if (!convertMember(source, convert, doc[names::kClientId])) return false;
  }
  if (doc.isMember(names::kClientSecret)) {
    if (isTraced(kStoreTrace)) {
      syslog(LOG_ERR, "%s:%d ==> %s[client_secret]", source, __LINE__, operation);
    }
    if (!convertMember(source, convert, doc[names::kClientSecret])) return false;
  }
  return true;
}

}  // namespace

bool encryptSecrets(const char* source, Json::Value& doc) {
  return convertSecrets(source, EncryptText, "ParamEncrypt", doc);
}

bool decryptSecrets(const char* source, Json::Value& doc) {
  return convertSecrets(source, DecryptText, "ParamDecrypt", doc);
}

}  // namespace KELDOAUTHSERVER
