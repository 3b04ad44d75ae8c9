// The key: the stand-in cipher's files, and whether the cipher, whosever it is,
// works and has the key of what is stored.

#include <algorithm>
#include <filesystem>
#include <set>
#include <string>
#include <system_error>

#include "core/oauth_errors.h"
#include "grants/grants.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/health/health.h"
#include "tools/keldoauth/storage/encrypted_values.h"
#include "tools/keldoauth/storage/trouble.h"
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

/// Only the log, the last of the tables, holds nothing encrypted.
bool holdsEncrypted(const Json::Value& tables) {
  for (Json::ArrayIndex i = 0; i + 1 < tables.size(); ++i) {
    if (tables[i]["rows"].asInt64() > 0) return true;
  }
  return false;
}

void checkClients(const grants::Grants& grants, Problems& problems) try {
  const auto all = grants.applications.all();
  const auto unreadable = std::count_if(all.begin(), all.end(), [](const auto& application) {
    return !isDecrypted(application.identifier.text());
  });
  if (unreadable == 0) return;
  problems.add(names::kClientInfoTable,
               counted(static_cast<std::size_t>(unreadable), "identifier") + " cannot be decrypted",
               "the platform's key is not the one that encrypted them; put it back");
} catch (const grants::Trouble& trouble) {
  problems.add(names::kClientInfoTable, failureOf(trouble).text());
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

void inspectCipher(const grants::Grants& grants, const Json::Value& tables, Problems& problems) {
  const bool works = canEncrypt();
  if (works || absenceOfKey().empty()) {
    if (!works) reportUselessCipher(problems);
    checkClients(grants, problems);
  } else if (holdsEncrypted(tables)) {
    problems.add("key", keyFiles().current + " is missing",
                 "what is encrypted cannot be read without it; put it back");
  }
}

}  // namespace tool
