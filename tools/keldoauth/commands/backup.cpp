// keldoauth backup and restore: whole copies of the database, made by SQLite's
// own means while the service runs.

#include <cstdint>
#include <filesystem>
#include <iostream>

#include "grants/grants.h"
#include "tools/keldoauth/commands/audit.h"
#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/terminal.h"
#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/storage/database_file.h"
#include "tools/keldoauth/storage/encrypted_values.h"
#include "tools/keldoauth/storage/engine_choice.h"
#include "tools/keldoauth/storage/files.h"
#include "tools/keldoauth/storage/trouble.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

Json::Value describe(const std::string& file, std::uintmax_t bytes) {
  Json::Value document;
  document["file"] = file;
  document["bytes"] = Json::UInt64(bytes);
  return document;
}

// Backup ----------------------------------------------------------------------------

/// What is wrong with the copy was wrong with the store.
void requireSound(DatabaseFile& copy) try { copy.requireStore(); } catch (const Failure& failure) {
  throw Failure(kUnavailable, "the database is no whole store: " + failure.text(),
                "no copy was kept; an older one can be restored");
}

void copyStoreTo(const Draft& draft) {
  DatabaseFile store(names::kDatabaseFile, DatabaseFile::Use::kWrite);
  DatabaseFile copy(draft);
  store.copyTo(copy);
}

void warnOfStranger(const std::string& stranger) {
  std::cerr << "keldoauth: backup: the store has what no store has: " + printable(stranger) +
                   "\nhint: the copy is kept, but 'restore' refuses it; remove the " +
                   "intruder from the store and make another copy\n";
}

Answer backup(const Arguments& arguments) {
  requireFile("'pg_dump -Fc', run by the server's administrator, makes a copy");
  Draft draft(*arguments.file);
  copyStoreTo(draft);
  Answer answer;
  {
    DatabaseFile copy(draft);
    requireSound(copy);
    const std::string stranger = copy.stranger();
    if (!stranger.empty()) {
      warnOfStranger(stranger);
      answer.exit = kUnhealthy;
    }
  }
  draft.publish();
  answer.document = describe(*arguments.file, draft.size());
  return answer;
}

void printBackup(const Json::Value& document, std::ostream& out) {
  out << "Wrote " << cellText(document["file"]) << " (" << cellText(document["bytes"])
      << " bytes), checked.\n"
      << "Only the platform's key decrypts it: keep a copy of the key elsewhere.\n";
}

// Restore ---------------------------------------------------------------------------

/// Makes an empty store where there is none, as any program of the service
/// would.
void requireTarget() try { grants::Grants(); } catch (const grants::Trouble& trouble) {
  const Failure failure = failureOf(trouble);
  throw Failure(failure.exit, failure.what(),
                "if the database is damaged, move it away together with its journal", failure.code);
}

void copyToStore(DatabaseFile& copy) {
  DatabaseFile store(names::kDatabaseFile, DatabaseFile::Use::kWrite);
  copy.copyTo(store);
  store.requireStore();
}

/// What became of the store, by a look at the file itself: a call that failed
/// may have done all of its work before.
std::string fateOfStore(std::uint64_t before, std::uint64_t wanted) try {
  DatabaseFile store(names::kDatabaseFile, DatabaseFile::Use::kWrite);
  store.requireStore();
  const std::uint64_t now = store.digest();
  if (now == before) return "the store is as it was";
  if (now != wanted) return "the store is neither as it was nor as the copy: somebody wrote to it";
  return "the store was replaced all the same, but a power cut may undo it; run the command again";
} catch (const Failure& failure) {
  return "whether the store was replaced cannot be seen: " + failure.text();
}

std::uint64_t digestOfStore() try {
  return DatabaseFile(names::kDatabaseFile, DatabaseFile::Use::kWrite).digest();
} catch (const Failure& failure) {
  throw Failure(failure.exit, failure.what(), failure.hintAnd("the store is as it was"),
                failure.code);
}

void replaceStore(DatabaseFile& copy) {
  const std::uint64_t wanted = copy.digest();
  const std::uint64_t before = digestOfStore();
  try {
    copyToStore(copy);
  } catch (const Failure& failure) {
    throw Failure(failure.exit, failure.what(), failure.hintAnd(fateOfStore(before, wanted)),
                  failure.code);
  }
}

/// Whether the key is that of the values restored; null when that cannot be
/// known because the cipher does not work.
Json::Value keyFits() try {
  if (isAllReadable()) return true;
  encrypted("probe");
  return false;
} catch (const Failure&) {
  return absenceOfKey().empty() ? Json::Value() : Json::Value(false);
}

void warnOfKey(const Json::Value& fits) {
  const std::string missing = absenceOfKey();
  std::string warning = "the platform's key is not the one of this copy";
  std::string hint = "put back the key that belongs to it; until then no client is found";
  if (fits.isNull()) {
    warning = "the platform's cipher does not work for this user";
    hint =
        "the system log says why; 'keldoauth status', run by the service's user, says whether "
        "its key fits";
  } else if (!missing.empty()) {
    warning = missing;
  }
  std::cerr << "keldoauth: restore: " + printable(warning) + "\nhint: " + printable(hint) + "\n";
}

void requireNoStranger(DatabaseFile& copy, const std::string& path) {
  const std::string stranger = copy.stranger();
  if (stranger.empty()) return;
  throw Failure(kRefused, path + " has what no store has: " + stranger,
                "it would work on in the store; a copy of the file without it can be restored");
}

/// What is checked is what is restored: a file may change meanwhile, whatever
/// locks are on it.
void readInto(DatabaseFile& copy, const std::string& path) {
  DatabaseFile file(path, DatabaseFile::Use::kRead);
  file.requireStore();
  file.copyTo(copy);
  copy.requireStore();
  requireNoStranger(copy, path);
}

Answer restore(const Arguments& arguments) {
  requireFile("'pg_restore --clean', run by the server's administrator, puts back a copy");
  const std::string& path = *arguments.file;
  requireReadableFile(path);
  if (isSameFile(path, names::kDatabaseFile)) {
    throw Failure(kRefused, path + " is the database itself");
  }
  DatabaseFile copy(path, DatabaseFile::Use::kMemory);
  readInto(copy, path);
  confirm(arguments, "Replace everything in the store by " + printable(path) + "?");

  const MaintenanceLock lock;
  requireTarget();
  replaceStore(copy);

  Answer answer{describe(path, std::filesystem::file_size(path))};
  if (!isRecorded("restore", "Database restored")) answer.exit = kUnhealthy;
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
