#include "service/settings/private_text.h"

#include <fcntl.h>
#include <json/reader.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <memory>

#include "service/settings/settings.h"
#include "utils/descriptor.h"
#include "utils/folder.h"

namespace keldoauth::service {
namespace {

using KELDOAUTHSERVER::Descriptor;

constexpr int kDeepest = 20;

[[noreturn]] void fail(const std::string& path, const std::string& why) {
  throw SettingsFault({path + ": " + why});
}

[[noreturn]] void failByErrno(const std::string& path) {
  fail(path, std::strerror(errno));
}

/// Up to the first piece beyond what may be there.
std::string readAll(const std::string& path, int file, std::size_t most) {
  std::string text;
  std::array<char, 4096> piece{};
  while (text.size() <= most) {
    const ssize_t got = read(file, piece.data(), piece.size());
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) failByErrno(path);
    if (got == 0) break;
    text.append(piece.data(), static_cast<std::size_t>(got));
  }
  return text;
}

/// A private file under a name of nobody's beside the one that it is for; the
/// name is gone at the end of the scope.
class Draft {
 public:
  explicit Draft(const std::string& path)
      : name_(path + ".XXXXXX"), file_(mkostemp(name_.data(), O_CLOEXEC)) {
    if (!file_.isOpen()) failByErrno(path);
  }
  ~Draft() { unlink(name_.c_str()); }
  Draft(const Draft&) = delete;
  Draft& operator=(const Draft&) = delete;

  /// On the disk before it gets its name. The mode owes nothing to the umask.
  [[nodiscard]] bool publish(const std::string& path, const std::string& text) const {
    return fchmod(file_.get(), S_IRUSR | S_IWUSR) == 0 &&
           KELDOAUTHSERVER::writeAll(file_.get(), text) && fsync(file_.get()) == 0 &&
           link(name_.c_str(), path.c_str()) == 0;
  }

 private:
  std::string name_;
  Descriptor file_;
};

}  // namespace

TextFile readTextFile(const std::string& path, std::size_t most) {
  // A pipe in its place does not stop us.
  const Descriptor file(open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
  struct stat status {};
  if (!file.isOpen() || fstat(file.get(), &status) != 0) failByErrno(path);
  if (!S_ISREG(status.st_mode)) fail(path, "is no regular file");
  if ((status.st_mode & S_IWOTH) != 0) fail(path, "everybody can write to it");
  TextFile read{readAll(path, file.get(), most), (status.st_mode & S_IROTH) != 0};
  if (read.text.size() > most) fail(path, "is too long");
  return read;
}

void makePrivateFile(const std::string& path, const std::string& text) {
  const Draft draft(path);
  if (!draft.publish(path, text) || !KELDOAUTHSERVER::syncFolderOf(path)) failByErrno(path);
}

Json::Value parseJsonObject(const std::string& text, const std::string& path) {
  Json::CharReaderBuilder builder;
  Json::CharReaderBuilder::strictMode(&builder.settings_);
  builder["allowComments"] = true;
  builder["stackLimit"] = kDeepest;
  const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  Json::Value document;
  std::string errors;
  bool isRead = false;
  try {
    isRead = reader->parse(text.data(), text.data() + text.size(), &document, &errors);
  } catch (const Json::Exception&) {
    fail(path, "is nested too deeply");
  }
  // "* Line 3, Column 5", and on the next line what may quote the text.
  if (!isRead) fail(path, "is no JSON: " + errors.substr(0, errors.find('\n')));
  if (!document.isObject()) fail(path, "is no JSON object");
  return document;
}

}  // namespace keldoauth::service
