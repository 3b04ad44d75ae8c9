// Identifiers and secrets as they stand in the file: the library's own look-ups
// would decrypt them.

#ifndef KELDOAUTH_TOOLS_ENCRYPTED_VALUES_H
#define KELDOAUTH_TOOLS_ENCRYPTED_VALUES_H

#include <string>
#include <vector>

#include "core/oauth_db_basic.h"
#include "utils/oauth_names.h"

namespace tool {

/// The tables with encrypted columns.
inline constexpr const char* kTablesWithSecrets[] = {KELDOAUTHSERVER::names::kClientInfoTable,
                                                     KELDOAUTHSERVER::names::kGrantCodeTable,
                                                     KELDOAUTHSERVER::names::kTokenTable};

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

/// Where the stand-in cipher has its key, and where a new one waits while
/// `keldoauth rekey` is at work, or after that was interrupted: what the
/// environment said before useKey() changed it.
struct KeyFiles {
  std::string current;
  std::string next;
};
KeyFiles keyFiles();

/// From now on the stand-in cipher of this process takes that key.
void useKey(const std::string& file);

/// Whether the cipher's key is that of every value in the database. Throws
/// Failure.
bool isAllReadable();

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_ENCRYPTED_VALUES_H
