#include "core/secrets.h"

#include <array>
#include <cstddef>
#include <cstring>
#include <string>

#include "core/log_lines.h"
#include "platform/keldcore.h"
#include "utils/diagnostics.h"
#include "utils/oauth_names.h"
#include "utils/wide_time.h"

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
  syslog(LOG_ERR, "%s:%d Data Encrypt failed", source, line::kEncryptFailed);
  return false;
}

bool DecryptText(const char* source, const std::string& in, std::string& out) {
  if (convertText(KCORECryptSzDecrypt, in, out)) return true;
  syslog(LOG_ERR, "%s:%d Data Decrypt failed", source, line::kDecryptFailed);
  return false;
}

/// A column to convert, with its trace.
struct Secret {
  const char* column;
  const char* trace;  // format of the line: source, number, operation
  int encryptLine;
  int decryptLine;
};

/// In the order in which they are converted.
constexpr std::array<Secret, 2> kSecrets{{
    {names::kClientId, "%s:%d ==> %s[client_id]", line::kEncryptClientIdEntry,
     line::kDecryptClientIdEntry},
    {names::kClientSecret, "%s:%d ==> %s[client_secret]", line::kEncryptClientSecretEntry,
     line::kDecryptClientSecretEntry},
}};

/// One of the two directions.
struct Conversion {
  const char* operation;
  bool (*convert)(const char* source, const std::string& in, std::string& out);
  int Secret::*line;
};

constexpr Conversion kEncryption{"ParamEncrypt", EncryptText, &Secret::encryptLine};
constexpr Conversion kDecryption{"ParamDecrypt", DecryptText, &Secret::decryptLine};

bool convertSecrets(const char* source, const Conversion& conversion, Json::Value& doc) {
  if (!doc.isObject()) return true;

  for (const Secret& secret : kSecrets) {
    if (!doc.isMember(secret.column)) continue;
    if (isTraced(kStoreTrace)) {
      syslog(LOG_ERR, secret.trace, source, secret.*conversion.line, conversion.operation);
    }
    Json::Value& value = doc[secret.column];
    std::string text;
    if (!conversion.convert(source, value.asString(), text)) return false;
    value = text;
  }
  return true;
}

}  // namespace

bool encryptSecrets(const char* source, Json::Value& doc) {
  return convertSecrets(source, kEncryption, doc);
}

bool decryptSecrets(const char* source, Json::Value& doc) {
  return convertSecrets(source, kDecryption, doc);
}

}  // namespace KELDOAUTHSERVER
