// The key: the stand-in cipher's files, and whether the cipher, whosever it is,
// works and has the key of what is stored.

#include <filesystem>
#include <set>
#include <string>
#include <system_error>

#include "core/oauth_db_basic.h"
#include "core/oauth_errors.h"
#include "tools/keldoauth/console/clock.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/health/health.h"
#include "tools/keldoauth/storage/encrypted_values.h"
#include "tools/keldoauth/storage/stores.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

namespace fs = std::filesystem;

/// In their order, so that a report is the same each time.
std::set<fs::path> namesIn(const fs::path& folder) {
  std::set<fs::path> names;
  std::error_code error;
  for (fs::directory_iterator entry(folder, error), end; !error && entry != end;
       entry.increment(error)) {
    names.insert(entry->path());
  }
  return names;
}

bool startsWith(const std::string& text, const std::string& start) {
  return text.compare(0, start.size(), start) == 0;
}

bool canEncrypt() {
  Json::Value probe;
  probe[names::kClientId] = "probe";
  return OAUTHDBBasic::ParamEncrypt(probe) != 0;
}

/// Only the log, the last of the tables, holds nothing encrypted.
bool holdsEncrypted(const Json::Value& tables) {
  for (Json::ArrayIndex i = 0; i + 1 < tables.size(); ++i) {
    if (numberIn(tables[i]["rows"]) > 0) return true;
  }
  return false;
}

void checkClients(Problems& problems) try {
  Clients clients;
  Json::ArrayIndex unreadable = 0;
  for (const Json::Value& row : allRows(clients)) {
    if (!isDecrypted(row[names::kClientId].asString())) ++unreadable;
  }
  if (unreadable == 0) return;
  problems.add(names::kClientInfoTable, counted(unreadable, "identifier") + " cannot be decrypted",
               "the platform's key is not the one that encrypted them; put it back");
} catch (const Failure& failure) {
  problems.add(names::kClientInfoTable, failure.text());
}

void reportUselessCipher(Problems& problems) {
  problems.add("cipher", "cannot encrypt (" + std::to_string(errors::kEncryptFailed.code) + ")",
               "the platform's cipher or its key cannot be used; the system log says more");
}

}  // namespace

void inspectKeyFiles(Problems& problems) {
  const KeyFiles keys = keyFiles();
  for (const fs::path& file : namesIn(fs::path(keys.current).parent_path())) {
    if (file == keys.next) {
      // Parts of the store may be encrypted with either key.
      problems.add("key", "a change of it was interrupted: " + keys.next + " waits",
                   "keep both keys and run 'keldoauth rekey' again");
    } else if (startsWith(file, keys.current + ".")) {
      problems.add("key", "left over: " + file.string(),
                   "it may be a copy of the key: remove it, or keep it elsewhere");
    }
  }
}

void inspectCipher(const Json::Value& tables, Problems& problems) {
  const bool works = canEncrypt();
  if (works || absenceOfKey().empty()) {
    if (!works) reportUselessCipher(problems);
    checkClients(problems);
  } else if (holdsEncrypted(tables)) {
    problems.add("key", keyFiles().current + " is missing",
                 "what is encrypted cannot be read without it; put it back");
  }
}

}  // namespace tool
