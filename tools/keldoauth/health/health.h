// What `keldoauth status` looks at, one piece each: every function describes
// its piece in a document and adds what is wrong with it to the problems.

#ifndef KELDOAUTH_TOOLS_HEALTH_H
#define KELDOAUTH_TOOLS_HEALTH_H

#include <json/value.h>

#include <string>

namespace KELDOAUTHSERVER::grants {
class Grants;
}

namespace tool {

/// The list that `status` ends with: subject, what is wrong, what to do.
class Problems {
 public:
  void add(const std::string& subject, const std::string& message, const std::string& hint = {});
  [[nodiscard]] const Json::Value& list() const { return list_; }

 private:
  Json::Value list_{Json::arrayValue};
};

/// Owner, group, mode and size of "folder", "database", "settings", "debug_flag".
Json::Value inspectFiles(Problems& problems);

/// Bytes "free" on the disk of the folder, and "needed" there for the largest
/// purge; null where that cannot be known, and for a store on a server.
Json::Value inspectDisk(Problems& problems);

/// Key files that should not be there.
void inspectKeyFiles(Problems& problems);

/// Whether the cipher works and has the key of what is stored; `tables` is what
/// inspectDatabase() found in them.
void inspectCipher(const KELDOAUTHSERVER::grants::Grants& grants, const Json::Value& tables,
                   Problems& problems);

/// Address, settings and standbys of the server that the store is on; null for a
/// file.
Json::Value inspectServer(Problems& problems);

/// Damage, and what the library does not put into a database.
void inspectSoundness(Problems& problems);

/// Compares what the settings file says with what the library makes of it.
void inspectSettings(Problems& problems);

/// Whether the database opens and the cipher works, and how full the tables
/// are. `files` is what inspectFiles() found: a database that does not exist
/// yet is not created.
Json::Value inspectDatabase(const Json::Value& files, Problems& problems);

/// The switches of the diagnostics in the system log.
Json::Value inspectDiagnostics(Problems& problems);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_HEALTH_H
