// The files of the service: who owns them, who may read and write them.

#include <fcntl.h>
#include <grp.h>
#include <pwd.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>
#include <utility>

#include "tools/keldoauth/health/health.h"
#include "utils/oauth_names.h"

namespace names = KELDOAUTHSERVER::names;

namespace tool {
namespace {

constexpr mode_t kPermissions = 07777;

std::string folderOf(const std::string& path) {
  return path.substr(0, path.rfind('/'));
}

std::string userName(uid_t id) {
  const passwd* const entry = getpwuid(id);
  return entry != nullptr ? entry->pw_name : std::to_string(id);
}

std::string groupName(gid_t id) {
  const group* const entry = getgrgid(id);
  return entry != nullptr ? entry->gr_name : std::to_string(id);
}

std::string octal(mode_t mode) {
  std::array<char, 8> text{};
  std::snprintf(text.data(), text.size(), "%04o", static_cast<unsigned int>(mode & kPermissions));
  return text.data();
}

/// A path and what is known about it; `status` is all zero when it is absent.
struct Inspected {
  explicit Inspected(std::string name) : path(std::move(name)) {
    const bool isThere = stat(path.c_str(), &status) == 0;
    error = isThere ? 0 : errno;
  }

  [[nodiscard]] bool exists() const { return error == 0; }
  [[nodiscard]] bool isAbsent() const { return error == ENOENT || error == ENOTDIR; }
  [[nodiscard]] bool allowsOthers(mode_t bits) const { return (status.st_mode & bits) != 0; }

  [[nodiscard]] Json::Value document() const {
    Json::Value found;
    found["path"] = path;
    found["exists"] = exists();
    found["error"] = exists() || isAbsent() ? Json::Value() : Json::Value(std::strerror(error));
    for (const char* fact : {"owner", "group", "mode", "size"}) found[fact] = Json::Value();
    if (!exists()) return found;
    found["owner"] = userName(status.st_uid);
    found["group"] = groupName(status.st_gid);
    found["mode"] = octal(status.st_mode);
    if (S_ISREG(status.st_mode)) found["size"] = Json::Int64(status.st_size);
    return found;
  }

  std::string path;
  struct stat status {};
  int error = 0;
};

std::string withMode(const Inspected& file, const char* fault) {
  return std::string(fault) + " (mode " + octal(file.status.st_mode) + ")";
}

void checkFolder(const Inspected& folder, Problems& problems) {
  if (!folder.exists()) {
    problems.add("folder", "cannot be reached: " + std::string(std::strerror(folder.error)),
                 "the package's installation creates " + folder.path);
    return;
  }
  if (faccessat(AT_FDCWD, folder.path.c_str(), W_OK | X_OK, AT_EACCESS) != 0) {
    const int error = errno;  // looking the name up has its own
    problems.add("folder",
                 "cannot be written by user " + userName(geteuid()) + ": " + std::strerror(error),
                 "the database writes its journal there; without it nothing can be changed");
  }
  if (folder.allowsOthers(S_IWGRP | S_IWOTH)) {
    problems.add("folder", withMode(folder, "can be written by more than its owner"),
                 "whoever writes it can put another database in place; chmod go-w");
  }
}

void checkDatabase(const Inspected& database, Problems& problems) {
  if (database.exists() && database.allowsOthers(S_IRWXG | S_IRWXO)) {
    problems.add("database", withMode(database, "is open to more than its owner"),
                 "codes and tokens stand in it in clear; chmod 600");
  }
}

void checkSettings(const Inspected& settings, Problems& problems) {
  if (settings.exists() && settings.allowsOthers(S_IWGRP | S_IWOTH)) {
    problems.add("settings", withMode(settings, "can be written by more than its owner"),
                 "chmod go-w");
  }
}

/// What a crash left half done is rolled back by the service's programs, which
/// run as the folder's owner and must be able to read it.
void checkJournals(const Inspected& folder, Problems& problems) {
  for (const char* suffix : {"-journal", "-wal"}) {
    const Inspected journal(std::string(names::kDatabaseFile) + suffix);
    if (!folder.exists() || !journal.exists()) continue;
    if (journal.status.st_uid == folder.status.st_uid) continue;
    problems.add("journal",
                 journal.path + " belongs to " + userName(journal.status.st_uid) +
                     ", the folder to " + userName(folder.status.st_uid),
                 "give it to the folder's owner by chown; never delete it");
  }
}

}  // namespace

Json::Value inspectFiles(Problems& problems) {
  const Inspected folder(folderOf(names::kDatabaseFile));
  const Inspected database(names::kDatabaseFile);
  const Inspected settings(names::kSettingsFile);
  checkFolder(folder, problems);
  checkDatabase(database, problems);
  checkSettings(settings, problems);
  checkJournals(folder, problems);

  Json::Value files;
  files["folder"] = folder.document();
  files["database"] = database.document();
  files["settings"] = settings.document();
  files["debug_flag"] = Inspected(names::kDebugFlagFile).document();
  return files;
}

}  // namespace tool
