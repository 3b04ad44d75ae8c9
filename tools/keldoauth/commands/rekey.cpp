// keldoauth rekey: a new key for the stand-in cipher, and every encrypted value
// of the store encrypted anew.
//
// Two files are at stake, the database and the key, and the machine may stop at
// any moment. The new key waits beside the old one under its own name; the
// database changes in one transaction, in which every value is read back with
// the new key before it is committed; it is read once more from the file, and
// then the new key takes the old one's place. A run that was interrupted is
// taken up by the next: values that the waiting key decrypts are done.

#include <unistd.h>

#include <cstdio>
#include <filesystem>
#include <ostream>
#include <utility>
#include <vector>

#include "core/oauth_db_basic.h"
#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/terminal.h"
#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/storage/encrypted_values.h"
#include "tools/keldoauth/storage/files.h"
#include "tools/keldoauth/storage/stores.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

// Keys ------------------------------------------------------------------------------

void requireKeyFile(const KeyFiles& keys) {
  if (std::filesystem::exists(keys.current)) return;
  throw Failure(kRefused, "no key file " + keys.current,
                "only the stand-in cipher has one; it is made when it is first needed");
}

/// The key to come. An interrupted run may have left one, and values that are
/// encrypted with it. One that is made here is gone with the scope, until it is
/// to be kept.
class NextKey {
 public:
  /// A platform library that keeps its key elsewhere gives the same ciphertext
  /// whatever the variable says.
  explicit NextKey(const KeyFiles& keys)
      : file_(keys.next), isMineToRemove_(!std::filesystem::exists(file_)) {
    useKey(keys.current);
    const std::string before = encrypted("probe");
    useKey(keys.next);
    if (encrypted("probe") == before) {
      throw Failure(kRefused, "the platform's cipher does not take its key from a file");
    }
  }
  ~NextKey() {
    if (isMineToRemove_) unlink(file_.c_str());
  }
  NextKey(const NextKey&) = delete;
  NextKey& operator=(const NextKey&) = delete;

  /// From now on values may depend on it.
  void keep() {
    syncFolderOf(file_);
    isMineToRemove_ = false;
  }

 private:
  std::string file_;
  bool isMineToRemove_;
};

/// The old key goes here. A commit survives a power cut only when the folder
/// knows that its journal is gone.
void replaceKey(const KeyFiles& keys) {
  syncFolderOf(names::kDatabaseFile);
  if (std::rename(keys.next.c_str(), keys.current.c_str()) != 0) throw systemFailure(keys.current);
  syncFolderOf(keys.current);
}

// Values ----------------------------------------------------------------------------

/// Those that the current key decrypts, with their clear text. Throws for a
/// value that neither key does.
std::vector<EncryptedValue> valuesToConvert(OAUTHDBBasic& store, const KeyFiles& keys) {
  std::vector<EncryptedValue> todo;
  std::vector<EncryptedValue> others;
  useKey(keys.current);
  for (EncryptedValue& value : encryptedValues(store)) {
    (decrypt(value) ? todo : others).push_back(std::move(value));
  }
  useKey(keys.next);
  for (EncryptedValue& value : others) {
    if (decrypt(value)) continue;
    throw Failure(kRefused,
                  store.GetTabName() + " " + value.id + ": " + value.column +
                      " is encrypted with another key",
                  "nothing was changed");
  }
  return todo;
}

/// With the next key in use.
void convertValues(OAUTHDBBasic& store, const std::vector<EncryptedValue>& values) {
  for (const EncryptedValue& value : values) {
    Json::Value request;
    request[names::kCondition][names::kId] = value.id;
    request[names::kModified][value.column] = value.clear;
    if (!store.DBEdit(request)) throw libraryFailure(store);
  }
}

void requireAllReadable(OAUTHDBBasic& store) {
  for (EncryptedValue& value : encryptedValues(store)) {
    if (!decrypt(value)) throw Failure(kUnavailable, "a value cannot be read back");
  }
}

std::size_t convertStore(const KeyFiles& keys, NextKey& next) {
  std::size_t converted = 0;
  OAUTHDBBasic store;
  requireReady(store);
  Transaction transaction(store);
  for (const char* table : kTablesWithSecrets) {
    store.SetTabName(table);
    const std::vector<EncryptedValue> values = valuesToConvert(store, keys);
    convertValues(store, values);
    requireAllReadable(store);
    converted += values.size();
  }
  next.keep();
  transaction.commit();
  return converted;
}

/// Through a connection of its own, and with what came in since the commit.
void verifyStore() {
  if (isAllReadable()) return;
  throw Failure(kUnavailable, "the store has values that the new key does not decrypt",
                "both keys are still there; stop the service and run the command again");
}

Answer rekey(const Arguments& arguments) {
  const KeyFiles keys = keyFiles();
  requireKeyFile(keys);
  confirm(arguments,
          "Encrypt every identifier and secret with a new key? "
          "Stop the service first: what it writes meanwhile would be lost.");
  const MaintenanceLock lock;
  NextKey next(keys);
  Answer answer;
  answer.document["converted"] = Json::UInt64(convertStore(keys, next));
  verifyStore();
  replaceKey(keys);
  answer.document["key_file"] = keys.current;
  return answer;
}

void printRekeyed(const Json::Value& document, std::ostream& out) {
  out << "Encrypted "
      << counted(static_cast<std::size_t>(document["converted"].asUInt64()), "value")
      << " with a new key, which is now in " << cellText(document["key_file"]) << ".\n"
      << "Copies made before need the key that they were made with.\n";
}

}  // namespace

const Command& rekeyCommand() {
  static const Command command{"rekey",
                               "Change the key of the stand-in cipher",
                               {option::kYes, option::kJson},
                               rekey,
                               printRekeyed,
                               Needs::kDatabase,
                               NewKey::kAllowed};
  return command;
}

}  // namespace tool
