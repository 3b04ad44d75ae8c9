#include "tools/keldoauth/storage/key_files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <vector>

#include "tools/keldoauth/console/failure.h"
#include "tools/keldoauth/storage/files.h"

namespace tool {
namespace {

namespace fs = std::filesystem;

constexpr char kKeyVariable[] = "KELDCORE_KEY_FILE";

/// Leaves nothing behind in memory.
struct Key {
  std::array<unsigned char, 64> bytes{};

  Key() = default;
  ~Key() { explicit_bzero(bytes.data(), bytes.size()); }
  Key(const Key&) = delete;
  Key& operator=(const Key&) = delete;

  [[nodiscard]] std::string_view text() const {
    return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
  }
};

/// "<name of the key>.draft-a1B2c3", as the stand-in calls it on a medium where
/// it needs a name.
bool isDraftOf(const std::string& key, const std::string& name) {
  constexpr std::size_t kRandomLength = 6;
  const std::string start = key + ".draft-";
  return name.size() == start.size() + kRandomLength && name.compare(0, start.size(), start) == 0;
}

}  // namespace

KeyFiles keyFiles() {
  static const std::string current = [] {
    const char* const chosen = secure_getenv(kKeyVariable);
    return std::string(chosen != nullptr && *chosen != '\0' ? chosen : KELDCORE_KEY_FILE);
  }();
  return {current, current + ".next"};
}

void useKey(const std::string& file) {
  setenv(kKeyVariable, file.c_str(), 1);
}

std::string absenceOfKey() {
  const std::string key = keyFiles().current;
  struct stat status {};
  const bool isMissing = lstat(key.c_str(), &status) != 0 && (errno == ENOENT || errno == ENOTDIR);
  return isMissing ? "the key file " + key + " is missing" : "";
}

std::string adviceOnCipher() {
  std::string missing = absenceOfKey();
  if (missing.empty()) {
    return "the platform's cipher or its key cannot be used; the system log says more";
  }
  return missing;
}

void drawKey(const std::string& path) {
  Key key;
  const Descriptor file(
      open(path.c_str(), O_CREAT | O_EXCL | O_NOFOLLOW | O_WRONLY | O_CLOEXEC, 0600));
  if (!file.isOpen()) throw systemFailure(path);
  const bool isWhole = fchmod(file.get(), S_IRUSR | S_IWUSR) == 0 &&
                       getentropy(key.bytes.data(), key.bytes.size()) == 0 &&
                       KELDOAUTHSERVER::writeAll(file.get(), key.text()) && fsync(file.get()) == 0;
  if (isWhole) return;
  const int error = errno;
  unlink(path.c_str());
  errno = error;
  throw systemFailure(path);
}

void removeKeyDrafts(const std::string& path) {
  const fs::path key = fs::absolute(path);
  std::vector<fs::path> drafts;
  for (const auto& entry : fs::directory_iterator(key.parent_path())) {
    if (isDraftOf(key.filename(), entry.path().filename())) drafts.push_back(entry.path());
  }
  for (const fs::path& draft : drafts) {
    if (unlink(draft.c_str()) != 0 && errno != ENOENT) throw systemFailure(draft);
  }
}

}  // namespace tool
