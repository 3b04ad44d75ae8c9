// A small file of counters that all processes of the service share. It has one
// size for ever: a name has its bucket, and takes one of the slots there.
//
// It is read and written, not mapped: a process that maps a file dies when
// another shortens it or the medium is full. A lock on the file, which the kernel
// takes back from a process that dies, makes changes whole; and nothing asks the
// processor for more than bytes.

#ifndef KELDOAUTH_SERVICE_PEOPLE_COUNTER_FILE_H
#define KELDOAUTH_SERVICE_PEOPLE_COUNTER_FILE_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>

namespace keldoauth::service {

struct CounterSlot {
  std::uint32_t tag;    // whose it is; 0: nobody's
  std::uint32_t until;  // a second of time(), its lower 32 bits
};

using CounterBucket = std::array<CounterSlot, 16>;

class CounterFile {
 public:
  static constexpr std::size_t kBuckets = 1280;

  explicit CounterFile(std::string path) : path_(std::move(path)) {}

  /// Lets `change` see a bucket, number below kBuckets, and writes it back when
  /// `change` says true; nobody else changes it meanwhile. A file that is missing,
  /// of another size or shape, or not ours alone (owner, mode 0600, one name, no
  /// link) is made anew, all counters at zero. False when that cannot be done, or
  /// another process keeps the lock for a second: `change` was not called, or
  /// what it wrote is lost.
  [[nodiscard]] bool change(std::size_t bucket,
                            const std::function<bool(CounterBucket&)>& change) const;

 private:
  std::string path_;
};

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PEOPLE_COUNTER_FILE_H
