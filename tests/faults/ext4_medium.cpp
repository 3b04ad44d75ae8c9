#include "tests/faults/ext4_medium.h"

#include <fcntl.h>
#include <linux/loop.h>
#include <sys/ioctl.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <system_error>
#include <utility>

namespace faults {
namespace {

namespace fs = std::filesystem;

constexpr off_t kSize = off_t{16} * 1024 * 1024;
constexpr char kOptions[] = "commit=300";
constexpr int kMostTries = 100;

void require(bool done, const std::string& what) {
  if (!done) throw std::system_error(errno, std::generic_category(), what);
}

/// Closed at the end of its scope.
class Descriptor {
 public:
  explicit Descriptor(const std::string& path, int flags, mode_t mode = 0)
      : number_(open(path.c_str(), flags | O_CLOEXEC, mode)) {
    require(number_ >= 0, "open " + path);
  }
  ~Descriptor() { close(number_); }
  Descriptor(const Descriptor&) = delete;
  Descriptor& operator=(const Descriptor&) = delete;

  [[nodiscard]] int number() const { return number_; }

 private:
  int number_;
};

/// Puts `image` behind the loop device `loop`, which lets go of it as soon as
/// it is neither open nor mounted. False when another process was faster.
bool attach(const Descriptor& loop, const Descriptor& image) {
  if (ioctl(loop.number(), LOOP_SET_FD, image.number()) != 0) {
    require(errno == EBUSY, "attach a loop device");
    return false;
  }
  loop_info64 info{};
  info.lo_flags = LO_FLAGS_AUTOCLEAR;
  const bool done = ioctl(loop.number(), LOOP_SET_STATUS64, &info) == 0;
  const int error = errno;
  if (!done) ioctl(loop.number(), LOOP_CLR_FD);
  errno = error;
  require(done, "set up a loop device");
  return true;
}

void mountOverLoop(const std::string& imagePath, const std::string& folder) {
  const Descriptor control("/dev/loop-control", O_RDWR);
  const Descriptor image(imagePath, O_RDWR);
  for (int tries = 0; tries < kMostTries; ++tries) {
    const int number = ioctl(control.number(), LOOP_CTL_GET_FREE);
    require(number >= 0, "get a loop device");
    const std::string device = "/dev/loop" + std::to_string(number);
    const Descriptor loop(device, O_RDWR);
    if (!attach(loop, image)) continue;
    require(mount(device.c_str(), folder.c_str(), "ext4", 0, kOptions) == 0, "mount " + device);
    return;
  }
  throw std::system_error(EBUSY, std::generic_category(), "get a loop device");
}

void makeFileSystem(const std::string& image) {
  {
    const Descriptor file(image, O_RDWR | O_CREAT | O_TRUNC, S_IRUSR | S_IWUSR);
    require(ftruncate(file.number(), kSize) == 0, "lengthen " + image);
  }
  const std::string command =
      "PATH=$PATH:/usr/sbin:/sbin mkfs.ext4 -q -F -E lazy_itable_init=0,lazy_journal_init=0 " +
      image;
  const int status = std::system(command.c_str());  // NOLINT(cert-env33-c): words of our own
  if (status == 0) return;
  const bool isMissing = WIFEXITED(status) && WEXITSTATUS(status) == 127;
  throw std::system_error(isMissing ? ENOENT : EIO, std::generic_category(), "mkfs.ext4");
}

/// Whether a machine has no such thing or keeps it from us.
bool isObstacle(int error) {
  return error == ENOENT || error == EACCES || error == EPERM || error == ENODEV ||
         error == ENXIO || error == ENOTTY || error == ENOSYS;
}

}  // namespace

std::string Ext4Medium::obstacle() {
  static const std::string found = []() -> std::string {
    const std::string folder = "/tmp/trial";
    fs::create_directory(folder);
    try {
      const Ext4Medium trial(folder, folder + ".img");
    } catch (const std::system_error& thrown) {
      if (!isObstacle(thrown.code().value())) throw;
      return thrown.what();
    }
    return {};
  }();
  return found;
}

Ext4Medium::Ext4Medium(std::string folder, std::string image)
    : folder_(std::move(folder)), image_(std::move(image)) {
  struct stat status {};
  require(stat(folder_.c_str(), &status) == 0, "stat " + folder_);
  makeFileSystem(image_);
  mountImage();
  rmdir((folder_ + "/lost+found").c_str());
  chmod(folder_.c_str(), status.st_mode & 07777U);
  settle();
}

Ext4Medium::~Ext4Medium() {
  umount2(folder_.c_str(), MNT_DETACH);
  unlink(image_.c_str());
  unlink((image_ + ".cut").c_str());
}

void Ext4Medium::settle() const {
  const Descriptor folder(folder_, O_RDONLY | O_DIRECTORY);
  require(syncfs(folder.number()) == 0, "sync " + folder_);
}

void Ext4Medium::cut() const {
  fs::copy_file(image_, image_ + ".cut", fs::copy_options::overwrite_existing);
}

void Ext4Medium::restart() {
  unmount();
  fs::rename(image_ + ".cut", image_);
  mountImage();
}

void Ext4Medium::mountImage() const {
  mountOverLoop(image_, folder_);
}

void Ext4Medium::unmount() const {
  require(umount(folder_.c_str()) == 0, "unmount " + folder_);
}

}  // namespace faults
