#include "tests/faults/small_medium.h"

#include <fcntl.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <system_error>

namespace faults {
namespace {

constexpr char kOptions[] = "size=512k,mode=700";
constexpr off_t kPage = 4096;

void require(bool done, const std::string& what) {
  if (!done) throw std::system_error(errno, std::generic_category(), what);
}

}  // namespace

SmallMedium::SmallMedium(const std::string& folder) : folder_(folder), filler_(folder + "/filler") {
  require(mount("small", folder.c_str(), "tmpfs", 0, kOptions) == 0, "mount " + folder);
}

SmallMedium::~SmallMedium() {
  umount2(folder_.c_str(), MNT_DETACH);
}

void SmallMedium::fill(int pages) const {
  const int file = open(filler_.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, S_IRUSR | S_IWUSR);
  require(file >= 0, "create " + filler_);
  static const std::array<char, kPage> page{};
  off_t size = 0;
  while (write(file, page.data(), page.size()) == static_cast<ssize_t>(page.size())) size += kPage;
  require(ftruncate(file, size - pages * kPage) == 0, "shorten " + filler_);
  close(file);
}

void SmallMedium::empty() const {
  unlink(filler_.c_str());
}

void SmallMedium::setReadOnly(bool readOnly) const {
  unsigned long flags = MS_REMOUNT;
  if (readOnly) flags |= MS_RDONLY;
  require(mount("small", folder_.c_str(), "tmpfs", flags, kOptions) == 0, "remount " + folder_);
}

}  // namespace faults
