#include "service/settings/kept_settings.h"

#include <sys/stat.h>

#include <utility>

namespace keldoauth::service {

FileStamp FileStamp::of(const std::string& path) {
  struct stat status {};
  if (stat(path.c_str(), &status) != 0) return {};
  return {status.st_dev, status.st_ino, status.st_size, status.st_mtim};
}

bool FileStamp::operator==(const FileStamp& other) const {
  return device == other.device && number == other.number && size == other.size &&
         written.tv_sec == other.written.tv_sec && written.tv_nsec == other.written.tv_nsec;
}

KeptSettings::KeptSettings(std::string path) : path_(std::move(path)) {}

/// The stamps are from before the files are read: who changes them meanwhile has
/// them read once more.
const Settings& KeptSettings::current() {
  const FileStamp stamp = FileStamp::of(path_);
  if (settings_ && stamp == stamp_ && FileStamp::of(settings_->keysFile) == keysStamp_) {
    return *settings_;
  }
  settings_.reset();
  Settings settings = readSettings(path_);
  stamp_ = stamp;
  keysStamp_ = FileStamp::of(settings.keysFile);
  return settings_.emplace(std::move(settings));
}

}  // namespace keldoauth::service
