// Files that hold secrets, call by call.

#ifndef KELDOAUTH_SERVICE_SIGNING_PRIVATE_FILE_H
#define KELDOAUTH_SERVICE_SIGNING_PRIVATE_FILE_H

#include <sys/stat.h>

#include <string>
#include <string_view>

#include "service/signing/key_file.h"
#include "utils/descriptor.h"

namespace keldoauth::service::signing {

using KELDOAUTHSERVER::Descriptor;

[[noreturn]] void fail(const std::string& path, const std::string& reason);
/// With the text of errno.
[[noreturn]] void failByErrno(const std::string& path);

/// Opened for reading; no link, and a pipe in its place does not stop us.
int openPrivate(const std::string& path);

/// Its status, when it is what KeyFile says that it has to be.
struct stat checkedStatus(const std::string& path, const Descriptor& file);

/// The whole text, from the start.
std::string textIn(const std::string& path, const Descriptor& file);

/// A new file beside the one that it is for, gone at the end of the scope unless
/// it got its name.
class Draft {
 public:
  /// `name` must be nobody's.
  explicit Draft(std::string name);
  ~Draft();
  Draft(const Draft&) = delete;
  Draft& operator=(const Draft&) = delete;

  /// On the disk, not only in the cache. The mode owes nothing to the umask.
  void write(std::string_view text, const Access& access) const;

  void publishAsNew(const std::string& path) const;
  void publishInPlaceOf(const std::string& path);

 private:
  std::string name_;
  Descriptor file_;
};

}  // namespace keldoauth::service::signing

#endif  // KELDOAUTH_SERVICE_SIGNING_PRIVATE_FILE_H
