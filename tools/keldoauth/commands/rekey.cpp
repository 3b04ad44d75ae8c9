// keldoauth rekey: a new key for the stand-in cipher, and every encrypted value
// of the store encrypted anew.
//
// Two files are at stake, the database and the key, and the machine may stop at
// any moment. The new key waits beside the old one under its own name; the
// database changes in one transaction, in which every value is read back with
// the new key before it is committed; it is read once more from the file, and
// then the new key takes the old one's place. A run that was interrupted is
// taken up by the next: values that the waiting key decrypts are done, and a
// waiting key that decrypts none is drawn anew.

#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <ostream>
#include <utility>
#include <vector>

#include "core/transaction.h"
#include "tools/keldoauth/commands/audit.h"
#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/terminal.h"
#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/storage/encrypted_values.h"
#include "tools/keldoauth/storage/engine_choice.h"
#include "tools/keldoauth/storage/files.h"
#include "tools/keldoauth/storage/key_files.h"
#include "tools/keldoauth/storage/trouble.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

constexpr int kWrongKey = 23;  // SQLITE_AUTH, of a store on a server

// Keys ------------------------------------------------------------------------------

void requireKeyFile() {
  const std::string missing = absenceOfKey();
  if (missing.empty()) return;
  throw Failure(kRefused, missing,
                "put it back; where nothing was encrypted yet, the stand-in cipher makes one "
                "when it is first needed");
}

/// The key to come. An interrupted run may have left one: it stays as long as a
/// value needs it. One that is drawn here is gone with the scope, until it is to
/// be kept.
class NextKey {
 public:
  explicit NextKey(const KeyFiles& keys) : keys_(keys) {}
  ~NextKey() {
    if (isMineToRemove_) unlink(keys_.next.c_str());
  }
  NextKey(const NextKey&) = delete;
  NextKey& operator=(const NextKey&) = delete;

  /// In place of one that waits for nothing, whatever it is. A platform library
  /// that keeps its key elsewhere gives the same ciphertext whatever the
  /// variable says.
  void draw() {
    useKey(keys_.current);
    const std::string before = encrypted("probe");
    if (unlink(keys_.next.c_str()) != 0 && errno != ENOENT) throw systemFailure(keys_.next);
    drawKey(keys_.next);
    isMineToRemove_ = true;
    useKey(keys_.next);
    if (encrypted("probe") == before) {
      throw Failure(kRefused, "the platform's cipher does not take its key from a file");
    }
  }

  /// From now on values may depend on it.
  void keep() {
    syncFolderOf(keys_.next);
    isMineToRemove_ = false;
  }

 private:
  const KeyFiles& keys_;
  bool isMineToRemove_ = false;
};

/// The old key goes here. A commit survives a power cut only when the folder
/// knows that its journal is gone.
void replaceKey(const KeyFiles& keys) {
  try {
    syncFolderOf(names::kDatabaseFile);
    if (std::rename(keys.next.c_str(), keys.current.c_str()) != 0) {
      throw systemFailure(keys.current);
    }
  } catch (const Failure& failure) {
    throw Failure(failure.exit, failure.what(),
                  "every value is encrypted with " + keys.next + "; run the command again");
  }
  try {
    useKey(keys.current);
    removeKeyDrafts(keys.current);
    syncFolderOf(keys.current);
  } catch (const Failure& failure) {
    throw Failure(failure.exit, failure.what(),
                  "the new key is in its place, but a power cut may bring both keys back; "
                  "then run the command again");
  }
}

// Values ----------------------------------------------------------------------------

/// The values of the store by the key that decrypts them, with their clear text.
struct Sorted {
  struct Value : EncryptedValue {
    const char* table;
  };
  std::vector<Value> current;
  std::vector<Value> next;
};

/// Throws for a value that neither key decrypts.
Sorted sortedValues(OAUTHDBBasic& store, const KeyFiles& keys) {
  Sorted sorted;
  useKey(keys.current);
  for (const char* table : tablesWithSecrets()) {
    store.SetTabName(table);
    for (EncryptedValue& value : encryptedValues(store)) {
      const bool isDone = decrypt(value);
      (isDone ? sorted.current : sorted.next).push_back({std::move(value), table});
    }
  }
  useKey(keys.next);
  for (Sorted::Value& value : sorted.next) {
    if (decrypt(value)) continue;
    throw Failure(kRefused,
                  std::string(value.table) + " " + value.id + ": " + value.column +
                      " is encrypted with another key",
                  "nothing was changed");
  }
  return sorted;
}

/// With the next key in use.
void convertValues(OAUTHDBBasic& store, const std::vector<Sorted::Value>& values) {
  for (const Sorted::Value& value : values) {
    Json::Value request;
    request[names::kCondition][names::kId] = value.id;
    request[names::kModified][value.column] = value.clear;
    store.SetTabName(value.table);
    if (!store.DBEdit(request)) throw libraryFailure(store);
  }
}

void requireAllReadable(OAUTHDBBasic& store) {
  for (const char* table : tablesWithSecrets()) {
    store.SetTabName(table);
    for (EncryptedValue& value : encryptedValues(store)) {
      if (!decrypt(value)) throw Failure(kUnavailable, "a value cannot be read back");
    }
  }
}

/// On a server the store knows which key it has, and lets no other in: after an
/// interruption that is the one that waits.
void useStoresKey(const KeyFiles& keys) {
  if (!isOnServer() || access(keys.next.c_str(), F_OK) != 0) return;
  const OAUTHDBBasic store;
  if (store.GetErrCode() == kWrongKey) useKey(keys.next);
}

std::size_t convertStore(const KeyFiles& keys, NextKey& next) {
  useStoresKey(keys);
  OAUTHDBBasic store;
  requireReady(store);
  Transaction transaction(store);
  if (!transaction.Begin()) throw libraryFailure(store);
  const Sorted sorted = sortedValues(store, keys);
  if (sorted.next.empty()) next.draw();
  convertValues(store, sorted.current);
  requireAllReadable(store);
  next.keep();
  if (!transaction.Commit()) throw libraryFailure(store);
  return sorted.current.size();
}

/// Through a connection of its own, and with what came in since the commit.
void verifyStore() {
  if (isAllReadable()) return;
  throw Failure(kUnavailable, "the store has values that the new key does not decrypt",
                "both keys are still there; stop the service and run the command again");
}

Answer rekey(const Arguments& arguments) {
  const KeyFiles keys = keyFiles();
  requireKeyFile();
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
  if (!isRecorded("rekey", "Key changed")) answer.exit = kUnhealthy;
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
