#include "service/people/counter_file.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <thread>

#include "utils/descriptor.h"
#include "utils/wide_time.h"

namespace keldoauth::service {
namespace {

/// Counters of another layout must not be taken for these.
struct Header {
  std::array<char, sizeof(CounterBucket)> text;
};
constexpr Header kHeader{{"keldoauth counters 1, 1280 buckets of 16\n"}};

static_assert(sizeof(CounterBucket) == 128, "the layout of the file");
constexpr std::size_t kFileBytes = sizeof(Header) + CounterFile::kBuckets * sizeof(CounterBucket);

class OpenFile {
 public:
  explicit OpenFile(int descriptor) : descriptor_(descriptor) {}

  [[nodiscard]] bool isOpen() const { return descriptor_.isOpen(); }

  [[nodiscard]] bool isOurs() const {
    struct stat file {};
    Header header{};
    return fstat(descriptor_.get(), &file) == 0 && S_ISREG(file.st_mode) &&
           file.st_uid == geteuid() && (file.st_mode & 07777U) == 0600 && file.st_nlink == 1 &&
           file.st_size == off_t{kFileBytes} && readAt(0, &header, sizeof header) &&
           header.text == kHeader.text;
  }

  /// Not for ever: whoever is stopped with the lock must not stop everybody.
  [[nodiscard]] bool lock() const {
    constexpr int kMostTries = 1000;
    for (int i = 0; i < kMostTries; ++i) {
      if (flock(descriptor_.get(), LOCK_EX | LOCK_NB) == 0) return true;
      if (errno != EWOULDBLOCK && errno != EINTR) return false;
      std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    return false;
  }

  bool readAt(std::size_t offset, void* into, std::size_t size) const {
    return pread(descriptor_.get(), into, size, off_t(offset)) == ssize_t(size);
  }
  [[nodiscard]] bool writeAt(std::size_t offset, const void* from, std::size_t size) const {
    return pwrite(descriptor_.get(), from, size, off_t(offset)) == ssize_t(size);
  }

 private:
  KELDOAUTHSERVER::Descriptor descriptor_;
};

int openAt(const std::string& path) {
  return open(path.c_str(), O_RDWR | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC);
}

/// Puts a file of zeros at `path`: of two that find none there the second keeps
/// what the first has made.
bool makeAnew(const std::string& path, bool isMissing) {
  std::string name = path + ".new-XXXXXX";
  const OpenFile file(mkostemp(name.data(), O_CLOEXEC));
  if (!file.isOpen()) return false;
  std::string zeros(kFileBytes, '\0');
  std::memcpy(zeros.data(), kHeader.text.data(), kHeader.text.size());
  const bool isWritten = file.writeAt(0, zeros.data(), zeros.size());
  if (isWritten && !isMissing && rename(name.c_str(), path.c_str()) == 0) return true;
  const bool isLinked =
      isWritten && isMissing && (link(name.c_str(), path.c_str()) == 0 || errno == EEXIST);
  unlink(name.c_str());
  return isLinked;
}

}  // namespace

bool CounterFile::change(std::size_t bucket,
                         const std::function<bool(CounterBucket&)>& change) const {
  for (int attempt = 0; attempt < 2; ++attempt) {
    const OpenFile file(openAt(path_));
    const bool isMissing = !file.isOpen() && errno == ENOENT;
    if (!file.isOpen() || !file.isOurs()) {
      if (attempt > 0 || !makeAnew(path_, isMissing)) return false;
      continue;
    }
    const std::size_t offset = sizeof(Header) + bucket * sizeof(CounterBucket);
    CounterBucket slots{};
    if (!file.lock() || !file.readAt(offset, &slots, sizeof slots)) return false;
    return !change(slots) || file.writeAt(offset, &slots, sizeof slots);
  }
  return false;
}

}  // namespace keldoauth::service
