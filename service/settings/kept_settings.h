// The settings of a process that answers more than one request: read again when
// somebody has changed them.

#ifndef KELDOAUTH_SERVICE_SETTINGS_KEPT_SETTINGS_H
#define KELDOAUTH_SERVICE_SETTINGS_KEPT_SETTINGS_H

#include <sys/types.h>

#include <ctime>
#include <optional>
#include <string>

#include "service/settings/settings.h"

namespace keldoauth::service {

/// What tells one state of a file from another.
struct FileStamp {
  dev_t device = 0;
  ino_t number = 0;
  off_t size = 0;
  std::timespec written{};

  /// All zero for a file that is not there.
  static FileStamp of(const std::string& path);
  bool operator==(const FileStamp& other) const;
};

class KeptSettings {
 public:
  explicit KeptSettings(std::string path);

  /// As they are now; good until the next call. Throws SettingsFault, and reads
  /// them again the next time.
  const Settings& current();

 private:
  std::string path_;
  std::optional<Settings> settings_;
  FileStamp stamp_;
  FileStamp keysStamp_;
};

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_SETTINGS_KEPT_SETTINGS_H
