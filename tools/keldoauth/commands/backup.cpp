// keldoauth backup and restore: whole copies of the database, made by SQLite's
// own means while the service runs.

#include <cstdlib>
#include <filesystem>
#include <iostream>

#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/terminal.h"
#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/storage/database_file.h"
#include "tools/keldoauth/storage/encrypted_values.h"
#include "tools/keldoauth/storage/files.h"
#include "tools/keldoauth/storage/stores.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

Json::Value describe(const std::string& file) {
  Json::Value document;
  document["file"] = file;
  document["bytes"] = Json::UInt64(std::filesystem::file_size(file));
  return document;
}

// Backup ----------------------------------------------------------------------------

/// What is wrong with the copy was wrong with the store.
void requireSound(DatabaseFile& copy) try { copy.requireStore(); } catch (const Failure& failure) {
  throw Failure(kUnavailable, "the database is no whole store: " + failure.text(),
                "no copy was kept; an older one can be restored");
}

Answer backup(const Arguments& arguments) {
  const Draft draft(*arguments.file);
  {
    DatabaseFile store(names::kDatabaseFile, DatabaseFile::Use::kWrite);
    DatabaseFile copy(draft.name(), DatabaseFile::Use::kWrite);
    store.copyTo(copy);
    copy.leaveWal();
    requireSound(copy);
  }
  draft.publish();
  return {describe(*arguments.file)};
}

void printBackup(const Json::Value& document, std::ostream& out) {
  out << "Wrote " << cellText(document["file"]) << " (" << cellText(document["bytes"])
      << " bytes), checked.\n"
      << "Only the platform's key decrypts it: keep a copy of the key elsewhere.\n";
}

// Restore ---------------------------------------------------------------------------

/// Makes an empty store where there is none, as any program of the service
/// would.
void requireTarget() try { Log(); } catch (const Failure& failure) {
  throw Failure(failure.exit, failure.what(),
                "if the database is damaged, move it away together with its journal", failure.code);
}

Failure nothingChanged(const Failure& failure) {
  return {failure.exit, failure.what(),
          failure.hint + (failure.hint.empty() ? "" : "; ") + "the store is as it was",
          failure.code};
}

void replaceStore(DatabaseFile& copy) {
  DatabaseFile store(names::kDatabaseFile, DatabaseFile::Use::kWrite);
  try {
    copy.copyTo(store);
  } catch (const Failure& failure) {
    throw nothingChanged(failure);
  }
  store.requireStore();
}

/// Whether the key is that of the values restored; null when that cannot be
/// known because the cipher does not work.
Json::Value keyFits() try {
  if (isAllReadable()) return true;
  encrypted("probe");
  return false;
} catch (const Failure&) {
  return {};
}

void warnOfKey(const Json::Value& fits) {
  std::cerr << "keldoauth: restore: "
            << (fits.isNull() ? "the platform's cipher does not work for this user\n"
                                "hint: the system log says why; 'keldoauth status', run by the "
                                "service's user, says whether its key fits\n"
                              : "the platform's key is not the one of this copy\n"
                                "hint: put back the key that belongs to it; until then no client "
                                "is found\n");
}

Answer restore(const Arguments& arguments) {
  const std::string& path = *arguments.file;
  requireReadableFile(path);
  if (isSameFile(path, names::kDatabaseFile)) {
    throw Failure(kRefused, path + " is the database itself");
  }
  DatabaseFile copy(path, DatabaseFile::Use::kRead);
  copy.holdStill();
  copy.requireStore();
  confirm(arguments, "Replace everything in the store by " + printable(path) + "?");

  const MaintenanceLock lock;
  requireTarget();
  replaceStore(copy);

  Answer answer{describe(path)};
  const Json::Value fits = keyFits();
  answer.document["key_fits"] = fits;
  if (fits != Json::Value(true)) {
    warnOfKey(fits);
    answer.exit = kUnhealthy;
  }
  return answer;
}

void printRestored(const Json::Value& document, std::ostream& out) {
  out << "Restored the store from " << cellText(document["file"]) << ".\n";
}

}  // namespace

const Command& backupCommand() {
  static const Command command{"backup",
                               "Copy the database, while the service runs",
                               {required(option::kBackupFile), option::kJson},
                               backup,
                               printBackup};
  return command;
}

const Command& restoreCommand() {
  static const Command command{"restore",
                               "Replace the database by a copy",
                               {required(option::kBackupFile), option::kYes, option::kJson},
                               restore,
                               printRestored,
                               Needs::kNothing,
                               NewKey::kAllowed};
  return command;
}

}  // namespace tool
