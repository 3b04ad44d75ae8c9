// Room on the disk: a purge that finds none fails, and the tables stay full.

#include <sys/stat.h>
#include <sys/statvfs.h>

#include <filesystem>
#include <string>

#include "tools/keldoauth/health/health.h"
#include "tools/keldoauth/storage/engine_choice.h"
#include "utils/oauth_names.h"

namespace names = KELDOAUTHSERVER::names;

namespace tool {
namespace {

using Bytes = unsigned long long;

/// SQLite's journal takes a copy of every page that changes, each with eight
/// bytes to it (a page has 512 bytes or more), and a sector for its head.
Bytes largestJournal(Bytes database) {
  constexpr Bytes kSmallestPage = 512;
  constexpr Bytes kPerPage = 8;
  constexpr Bytes kHead = 4096;
  return database + database / kSmallestPage * kPerPage + kHead;
}

/// What the folder's owner, as whom the service and the timer run, may still
/// write: the last part of a disk may be root's alone.
Bytes freeFor(uid_t owner, const struct statvfs& disk) {
  const Bytes blocks = owner == 0 ? disk.f_bfree : disk.f_bavail;
  return blocks * disk.f_frsize;
}

}  // namespace

Json::Value inspectDisk(Problems& problems) {
  const std::string path = std::filesystem::path(names::kDatabaseFile).parent_path();
  struct stat folder {};
  struct stat database {};
  struct statvfs disk {};
  const bool isKnown =
      stat(path.c_str(), &folder) == 0 && statvfs(path.c_str(), &disk) == 0 && disk.f_blocks > 0;
  Json::Value document;
  document["free"] = Json::Value();
  document["needed"] = Json::Value();
  if (!isKnown || isOnServer()) return document;

  stat(names::kDatabaseFile, &database);  // absent: of size 0
  const Bytes free = freeFor(folder.st_uid, disk);
  const Bytes needed = largestJournal(static_cast<Bytes>(database.st_size));
  document["free"] = Json::UInt64(free);
  document["needed"] = Json::UInt64(needed);
  if (free < needed) {
    problems.add(
        "disk",
        std::to_string(free) + " bytes are free, and a purge may need " + std::to_string(needed),
        "make room: without it nothing can be purged once the tables are full");
  }
  return document;
}

}  // namespace tool
