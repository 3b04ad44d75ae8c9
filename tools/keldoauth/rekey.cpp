// keldoauth rekey: a new key for the stand-in cipher, and every encrypted value
// of the store encrypted anew.
//
// Two files are at stake, the database and the key, and the machine may stop at
// any moment. The new key waits beside the old one under its own name; the
// database changes in one transaction, in which every value is read back with
// the new key before it is committed; then the new key takes the old one's
// place. A run that was interrupted is taken up by the next: values that the
// waiting key decrypts are done.

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <ostream>
#include <vector>

#include "core/oauth_db_basic.h"
#include "tools/keldoauth/command.h"
#include "tools/keldoauth/files.h"
#include "tools/keldoauth/output.h"
#include "tools/keldoauth/stores.h"
#include "tools/keldoauth/terminal.h"
#include "tools/keldoauth/text.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

constexpr char kKeyVariable[] = "KELDCORE_KEY_FILE";

struct Keys {
  std::string current;
  std::string next;
};

Keys keyFiles() {
  const char* chosen = secure_getenv(kKeyVariable);
  const std::string current = chosen != nullptr && *chosen != '\0' ? chosen : KELDCORE_KEY_FILE;
  return {current, current + ".next"};
}

void use(const std::string& keyFile) {
  setenv(kKeyVariable, keyFile.c_str(), 1);
}

// The library's own conversions, one value at a time -------------------------------

bool convert(int (*conversion)(Json::Value&), std::string& text) {
  Json::Value document;
  document[names::kClientId] = text;
  if (conversion(document) == 0) return false;
  text = document[names::kClientId].asString();
  return true;
}

std::string encrypted(std::string text) {
  if (!convert(OAUTHDBBasic::ParamEncrypt, text)) {
    throw Failure(kUnavailable, "the cipher refuses to encrypt", "the system log says why");
  }
  return text;
}

// Encrypted values ------------------------------------------------------------------

struct Value {
  std::string id;      // of the row
  std::string column;  // encrypted
  std::string cipher;  // as stored
  std::string clear;
};

constexpr const char* kTables[] = {names::kClientInfoTable, names::kGrantCodeTable,
                                   names::kTokenTable};

int collectRow(void* rows, int count, char** values, char** columns) {
  Json::Value row;
  for (int i = 0; i < count; ++i) row[columns[i]] = values[i] != nullptr ? values[i] : "";
  static_cast<Json::Value*>(rows)->append(row);
  return 0;
}

/// As they are stored: the library's own look-ups would decrypt them.
std::vector<Value> storedValues(OAUTHDBBasic& store) {
  Json::Value rows(Json::arrayValue);
  if (store.DBCmd("SELECT * FROM " + store.GetTabName(), collectRow, &rows) == 0) {
    throw libraryFailure(store);
  }
  std::vector<Value> values;
  for (const Json::Value& row : rows) {
    for (const char* column : {names::kClientId, names::kClientSecret}) {
      if (!row.isMember(column)) continue;
      values.push_back({row[names::kId].asString(), column, row[column].asString(), {}});
    }
  }
  return values;
}

bool decrypt(Value& value) {
  value.clear = value.cipher;
  return convert(OAUTHDBBasic::ParamDecrypt, value.clear);
}

/// Those that the current key decrypts, with their clear text. Throws for a
/// value that neither key does.
std::vector<Value> valuesToConvert(OAUTHDBBasic& store, const Keys& keys) {
  std::vector<Value> todo;
  std::vector<Value> others;
  use(keys.current);
  for (Value& value : storedValues(store)) {
    (decrypt(value) ? todo : others).push_back(std::move(value));
  }
  use(keys.next);
  for (Value& value : others) {
    if (decrypt(value)) continue;
    throw Failure(kRefused,
                  store.GetTabName() + " " + value.id + ": " + value.column +
                      " is encrypted with another key",
                  "nothing was changed");
  }
  return todo;
}

/// With the next key in use.
void convertValues(OAUTHDBBasic& store, const std::vector<Value>& values) {
  for (const Value& value : values) {
    Json::Value request;
    request[names::kCondition][names::kId] = value.id;
    request[names::kModified][value.column] = value.clear;
    if (!store.DBEdit(request)) throw libraryFailure(store);
  }
}

void requireAllReadable(OAUTHDBBasic& store) {
  for (Value& value : storedValues(store)) {
    if (!decrypt(value)) throw Failure(kUnavailable, "a value cannot be read back");
  }
}

std::size_t convertStore(const Keys& keys) {
  std::size_t converted = 0;
  OAUTHDBBasic store;
  requireReady(store);
  Transaction transaction(store);
  for (const char* table : kTables) {
    store.SetTabName(table);
    const std::vector<Value> values = valuesToConvert(store, keys);
    convertValues(store, values);
    requireAllReadable(store);
    converted += values.size();
  }
  transaction.commit();
  return converted;
}

// Keys ------------------------------------------------------------------------------

void requireKeyFile(const Keys& keys) {
  if (std::filesystem::exists(keys.current)) return;
  throw Failure(kRefused, "no key file " + printable(keys.current),
                "only the stand-in cipher has one; it is made when it is first needed");
}

/// Makes the next key, unless an interrupted run has left one. A platform
/// library that keeps its key elsewhere gives the same ciphertext whatever the
/// variable says.
void requireNextKey(const Keys& keys) {
  use(keys.current);
  const std::string before = encrypted("probe");
  use(keys.next);
  if (encrypted("probe") == before) {
    throw Failure(kRefused, "the platform's cipher does not take its key from a file");
  }
}

void replaceKey(const Keys& keys) {
  if (std::rename(keys.next.c_str(), keys.current.c_str()) != 0) throw systemFailure(keys.current);
  syncFolderOf(keys.current);
}

Answer rekey(const Arguments& arguments) {
  const Keys keys = keyFiles();
  requireKeyFile(keys);
  confirm(arguments,
          "Encrypt every identifier and secret with a new key? "
          "Stop the service first: what it writes meanwhile would be lost.");
  requireNextKey(keys);
  Answer answer;
  answer.document["converted"] = Json::UInt64(convertStore(keys));
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
                               printRekeyed};
  return command;
}

}  // namespace tool
