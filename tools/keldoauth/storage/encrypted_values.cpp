#include "tools/keldoauth/storage/encrypted_values.h"

#include <algorithm>

#include "tools/keldoauth/storage/engine_choice.h"
#include "tools/keldoauth/storage/trouble.h"
#include "utils/oauth_bounds.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

/// The library's own conversion, one value at a time.
bool convert(int (*conversion)(Json::Value&), std::string& text) {
  Json::Value document;
  document[names::kClientId] = text;
  if (conversion(document) == 0) return false;
  text = document[names::kClientId].asString();
  return true;
}

int collectRow(void* rows, int count, char** values, char** columns) {
  Json::Value row;
  for (int i = 0; i < count; ++i) row[columns[i]] = values[i] != nullptr ? values[i] : "";
  static_cast<Json::Value*>(rows)->append(row);
  return 0;
}

}  // namespace

std::vector<EncryptedValue> encryptedValues(OAUTHDBBasic& store) {
  Json::Value rows(Json::arrayValue);
  if (store.DBCmd("SELECT * FROM " + store.GetTabName(), collectRow, &rows) == 0) {
    throw libraryFailure(store);
  }
  std::vector<EncryptedValue> values;
  for (const Json::Value& row : rows) {
    for (const char* column : {names::kClientId, names::kClientSecret}) {
      if (!row.isMember(column)) continue;
      values.push_back({row[names::kId].asString(), column, row[column].asString(), {}});
    }
  }
  return values;
}

bool decrypt(EncryptedValue& value) {
  value.clear = value.cipher;
  return convert(OAUTHDBBasic::ParamDecrypt, value.clear);
}

std::string encrypted(std::string text) {
  if (convert(OAUTHDBBasic::ParamEncrypt, text)) return text;
  throw Failure(kUnavailable, "the cipher refuses to encrypt", adviceOnCipher());
}

bool isAllReadable() {
  OAUTHDBBasic store;
  requireReady(store);
  for (const char* table : tablesWithSecrets()) {
    store.SetTabName(table);
    std::vector<EncryptedValue> values = encryptedValues(store);
    if (!std::all_of(values.begin(), values.end(), decrypt)) return false;
  }
  return true;
}

bool canEncrypt() {
  std::string probe = "probe";
  return convert(OAUTHDBBasic::ParamEncrypt, probe);
}

bool isDecrypted(const std::string& text) {
  return text.size() == kIdentifierLength;
}

}  // namespace tool
