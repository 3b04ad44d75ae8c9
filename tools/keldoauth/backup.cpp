// keldoauth backup and restore: whole copies of the database, made by SQLite's
// own means while the service runs.

#include <fcntl.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <ostream>

#include "tools/keldoauth/command.h"
#include "tools/keldoauth/database_file.h"
#include "tools/keldoauth/files.h"
#include "tools/keldoauth/output.h"
#include "tools/keldoauth/stores.h"
#include "tools/keldoauth/terminal.h"
#include "tools/keldoauth/text.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

/// An empty file of the owner's alone under a name of its own beside `path`;
/// gone with the scope, together with whatever SQLite put beside it.
class Draft {
 public:
  explicit Draft(const std::string& path) : name_(path + ".XXXXXX") {
    const int descriptor = mkostemp(name_.data(), O_CLOEXEC);
    if (descriptor < 0) throw systemFailure(name_);
    close(descriptor);
  }
  ~Draft() {
    unlink(name_.c_str());
    unlink((name_ + "-journal").c_str());
  }
  Draft(const Draft&) = delete;
  Draft& operator=(const Draft&) = delete;

  [[nodiscard]] const std::string& name() const { return name_; }

  /// Gives the file the name `path`, which must be free.
  void publish(const std::string& path) const {
    if (link(name_.c_str(), path.c_str()) != 0) throw systemFailure(path);
    syncFolderOf(path);
  }

 private:
  std::string name_;
};

Json::Value describe(const std::string& file) {
  Json::Value document;
  document["file"] = file;
  document["bytes"] = Json::UInt64(std::filesystem::file_size(file));
  return document;
}

// Backup ----------------------------------------------------------------------------

Answer backup(const Arguments& arguments) {
  const std::string& path = *arguments.file;
  const Draft draft(path);
  {
    DatabaseFile store(names::kDatabaseFile, DatabaseFile::Use::kRead);
    DatabaseFile copy(draft.name(), DatabaseFile::Use::kWrite);
    store.copyTo(copy);
    copy.requireStore();
  }
  draft.publish(path);
  return {describe(path)};
}

void printBackup(const Json::Value& document, std::ostream& out) {
  out << "Wrote " << cellText(document["file"]) << " (" << cellText(document["bytes"])
      << " bytes), checked.\n"
      << "Only the platform's key decrypts it: keep a copy of the key elsewhere.\n";
}

// Restore ---------------------------------------------------------------------------

/// Makes an empty store where there is none, as any program of the service
/// would.
void requireTarget() {
  Log();
}

Answer restore(const Arguments& arguments) {
  const std::string& path = *arguments.file;
  DatabaseFile copy(path, DatabaseFile::Use::kRead);
  copy.requireStore();
  confirm(arguments, "Replace everything in the store by " + printable(path) + "?");

  requireTarget();
  DatabaseFile store(names::kDatabaseFile, DatabaseFile::Use::kWrite);
  copy.copyTo(store);
  store.requireStore();
  return {describe(path)};
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
                               printRestored};
  return command;
}

}  // namespace tool
