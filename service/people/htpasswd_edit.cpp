#include "service/people/htpasswd_edit.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <memory>
#include <optional>
#include <string_view>

#include "service/people/htpasswd.h"
#include "service/people/names.h"
#include "service/people/password_hash.h"
#include "utils/descriptor.h"
#include "utils/folder.h"
#include "utils/wide_time.h"

namespace keldoauth::service {
namespace {

using KELDOAUTHSERVER::Descriptor;

constexpr mode_t kNewMode = 0640;

[[noreturn]] void fail(const std::string& what) {
  throw DirectoryTrouble("cannot " + what + ": " + std::strerror(errno));
}

/// Where links lead; the path itself for a file that is to be made.
std::string placeOf(const std::string& path) {
  const std::unique_ptr<char, void (*)(void*)> place(realpath(path.c_str(), nullptr), std::free);
  if (place) return place.get();
  if (errno != ENOENT) fail("find " + path);
  return path;
}

/// Waits for whoever changes a file in the folder, and keeps others waiting. The
/// file itself is no place for a lock: it is replaced.
class FolderLock {
 public:
  explicit FolderLock(const std::string& folder)
      : folder_(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)) {
    if (!folder_.isOpen()) fail("open " + folder);
    while (flock(folder_.get(), LOCK_EX) != 0) {
      if (errno != EINTR) fail("lock " + folder);
    }
  }

  void sync() const { fsync(folder_.get()); }
  [[nodiscard]] struct stat state() const {
    struct stat state {};
    if (fstat(folder_.get(), &state) != 0) fail("look at the folder");
    return state;
  }

 private:
  Descriptor folder_;
};

/// The file that takes the place of another, and goes away unless it did.
class Replacement {
 public:
  explicit Replacement(const std::string& place)
      : place_(place), name_(place + ".new-XXXXXX"), file_(mkostemp(name_.data(), O_CLOEXEC)) {
    if (!file_.isOpen()) fail("make a file beside " + place);
  }
  ~Replacement() {
    if (!isInPlace_) unlink(name_.c_str());
  }
  Replacement(const Replacement&) = delete;
  Replacement& operator=(const Replacement&) = delete;

  void write(std::string_view text) const {
    if (!KELDOAUTHSERVER::writeAll(file_.get(), text)) fail("write the new file");
  }

  void belongTo(uid_t user, gid_t group, mode_t mode) const {
    struct stat now {};
    if (fstat(file_.get(), &now) != 0) fail("look at the new file");
    if ((now.st_uid != user || now.st_gid != group) && fchown(file_.get(), user, group) != 0) {
      fail("keep the owner of " + place_);
    }
    if (fchmod(file_.get(), mode) != 0) fail("keep the mode of " + place_);
  }

  void takePlace() {
    if (fsync(file_.get()) != 0) fail("write the new file");
    if (rename(name_.c_str(), place_.c_str()) != 0) fail("replace " + place_);
    isInPlace_ = true;
  }

 private:
  std::string place_;
  std::string name_;
  Descriptor file_;
  bool isInPlace_ = false;
};

/// The new text of the file; nothing when it stays as it is.
using Change = std::function<std::optional<std::string>(const std::string& text)>;

void change(const std::string& path, bool mayBeMissing, const Change& changed) {
  const std::string place = placeOf(path);
  const FolderLock folder(KELDOAUTHSERVER::folderOf(place));
  struct stat old {};
  const bool isThere = lstat(place.c_str(), &old) == 0;
  if (!isThere && (errno != ENOENT || !mayBeMissing)) fail("read " + path);
  const std::optional<std::string> text = changed(isThere ? htpasswdText(place) : "");
  if (!text) return;
  if (text->size() > kMaxHtpasswdBytes) throw DirectoryTrouble(path + " would exceed 1 MiB");

  const struct stat model = isThere ? old : folder.state();
  Replacement replacement(place);
  replacement.write(*text);
  replacement.belongTo(model.st_uid, model.st_gid,
                       isThere ? mode_t(old.st_mode & 07777U) : kNewMode);
  replacement.takePlace();
  folder.sync();
}

bool isOf(std::string_view row, const std::string& user) {
  return row.size() > user.size() && row[user.size()] == ':' && row.substr(0, user.size()) == user;
}

/// Calls `keep` for each line, without its end.
void eachRow(std::string_view text, const std::function<void(std::string_view)>& keep) {
  while (!text.empty()) {
    const std::string_view row = text.substr(0, text.find('\n'));
    text.remove_prefix(std::min(text.size(), row.size() + 1));
    keep(row);
  }
}

/// `line` stands where the first of this user stood, or at the end. Empty: none.
std::string withLine(const std::string& text, const std::string& user, const std::string& line,
                     bool& wasThere) {
  std::string changed;
  wasThere = false;
  eachRow(text, [&](std::string_view row) {
    if (!isOf(row, user)) {
      changed.append(row).append("\n");
    } else if (!wasThere) {
      wasThere = true;
      changed.append(line);
    }
  });
  if (!wasThere) changed.append(line);
  return changed;
}

}  // namespace

bool setHtpasswdUser(const std::string& path, const std::string& user,
                     const std::string& password) {
  if (!isUserName(user) || user.find(':') != std::string::npos || user[0] == '#') {
    throw DirectoryTrouble(
        "a name has 1 to 256 bytes of UTF-8 without control characters and colons, and does not "
        "start with #");
  }
  if (!isPassword(password)) {
    throw DirectoryTrouble("a password has 1 to 511 bytes without line ends");
  }
  const std::optional<std::string> hash = newHash(password);
  if (!hash) throw DirectoryTrouble("cannot compute a hash");
  bool wasThere = false;
  change(path, true, [&](const std::string& text) {
    return withLine(text, user, user + ":" + *hash + "\n", wasThere);
  });
  return !wasThere;
}

bool removeHtpasswdUser(const std::string& path, const std::string& user) {
  bool wasThere = false;
  change(path, false, [&](const std::string& text) -> std::optional<std::string> {
    std::string changed = withLine(text, user, "", wasThere);
    return wasThere ? std::optional<std::string>(std::move(changed)) : std::nullopt;
  });
  return wasThere;
}

}  // namespace keldoauth::service
