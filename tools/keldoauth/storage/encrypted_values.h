// Identifiers and secrets as they stand in the file: the library's own look-ups
// would decrypt them.

#ifndef KELDOAUTH_TOOLS_ENCRYPTED_VALUES_H
#define KELDOAUTH_TOOLS_ENCRYPTED_VALUES_H

#include <string>
#include <vector>

#include "core/oauth_db_basic.h"
#include "tools/keldoauth/storage/key_files.h"
#include "utils/oauth_names.h"

namespace tool {

struct EncryptedValue {
  std::string id;  // of the row
  std::string column;
  std::string cipher;  // as stored
  std::string clear;   // once decrypted
};

/// All of the table that `store` works on. Throws Failure.
std::vector<EncryptedValue> encryptedValues(KELDOAUTHSERVER::OAUTHDBBasic& store);

/// Fills in the clear text; false when the cipher's key is another one.
bool decrypt(EncryptedValue& value);

/// Throws Failure.
std::string encrypted(std::string text);

/// Whether the cipher works.
bool canEncrypt();

/// Whether the cipher's key is that of every value in the database. Throws
/// Failure.
bool isAllReadable();

/// Of an identifier or secret: what could not be decrypted comes as it is in the
/// file, and has another length.
bool isDecrypted(const std::string& text);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_ENCRYPTED_VALUES_H
