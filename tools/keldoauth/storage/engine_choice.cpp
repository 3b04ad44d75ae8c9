#include "tools/keldoauth/storage/engine_choice.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <filesystem>

#include "engines/choice/choice.h"
#include "tools/keldoauth/console/failure.h"
#include "tools/keldoauth/storage/files.h"
#include "utils/oauth_names.h"

namespace names = KELDOAUTHSERVER::names;
namespace engines = KELDOAUTHSERVER::engines;

namespace tool {
namespace {

bool isThere(const std::string& path) {
  struct stat status {};
  return lstat(path.c_str(), &status) == 0;
}

/// What SQLite has still to roll back goes by the file's name: set aside, the
/// file would be torn.
void requireNoJournal() {
  for (const char* suffix : {"-journal", "-wal"}) {
    struct stat status {};
    const std::string path = std::string(names::kDatabaseFile) + suffix;
    if (stat(path.c_str(), &status) != 0 || status.st_size == 0) continue;
    throw Failure(kRefused, path + " is there: something is at work in the store",
                  "stop the service; after a crash 'keldoauth status' finishes what is left");
  }
}

void rename(const std::string& from, const std::string& to) {
  if (std::rename(from.c_str(), to.c_str()) != 0) throw systemFailure(to);
}

}  // namespace

bool isOnServer() {
  return engines::isOnServer(names::kDatabaseFile);
}

std::string connectionFile() {
  const std::filesystem::path database = names::kDatabaseFile;
  return database.parent_path() / engines::kServerFile;
}

std::string fileSetAside() {
  return std::string(names::kDatabaseFile) + ".set-aside";
}

void chooseServer() {
  requireNoJournal();
  const std::string link = std::string(names::kDatabaseFile) + ".link";
  unlink(link.c_str());
  if (symlink(engines::kServerFile, link.c_str()) != 0) throw systemFailure(link);
  if (isThere(names::kDatabaseFile)) {
    // Under both names for a moment, so that there is never none.
    if (::link(names::kDatabaseFile, fileSetAside().c_str()) != 0) {
      const Failure failure = systemFailure(fileSetAside());
      unlink(link.c_str());
      throw failure;
    }
  }
  rename(link, names::kDatabaseFile);
  syncFolderOf(names::kDatabaseFile);
}

void chooseFile() {
  if (isThere(fileSetAside())) {
    rename(fileSetAside(), names::kDatabaseFile);
  } else if (unlink(names::kDatabaseFile) != 0) {
    throw systemFailure(names::kDatabaseFile);
  }
  syncFolderOf(names::kDatabaseFile);
}

void requireFile(const std::string& remedy) {
  if (!isOnServer()) return;
  throw Failure(kRefused, "the store is on a PostgreSQL server", remedy);
}

std::vector<const char*> tablesWithSecrets() {
  std::vector<const char*> tables{names::kClientInfoTable, names::kGrantCodeTable,
                                  names::kTokenTable};
  if (isOnServer()) tables.push_back("oauth_key");
  return tables;
}

}  // namespace tool
