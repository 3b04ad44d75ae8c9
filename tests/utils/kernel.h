// What this program asks the kernel for: which files it opens, and random bytes
// from getrandom() or, without it, from the device. What a test does not script
// goes to the kernel.

#ifndef KELDOAUTH_TESTS_UTILS_KERNEL_H
#define KELDOAUTH_TESTS_UTILS_KERNEL_H

#include <sys/types.h>

#include <cstddef>
#include <functional>
#include <string>
#include <vector>

class Kernel {
 public:
  static constexpr char kRandomDevice[] = "/dev/urandom";

  /// Forgets scripts and counts.
  static void release();

  static int opened(const std::string& path);
  static int askedForAccess(const std::string& path);

  /// -1 with errno set, or what a read returns for the buffer that it filled.
  using Read = std::function<ssize_t(char* buffer, std::size_t size)>;

  static void scriptGetrandom(Read read);
  static void scriptRandomDevice(Read read);
  static void refuseRandomDevice(int error);

  /// Bytes asked for, call by call.
  static std::vector<std::size_t> getrandomCalls();
  static std::vector<std::size_t> deviceReads();
  /// Reads of any file, and a hook that runs ahead of each.
  static int reads();
  static void beforeRead(std::function<void()> hook);
  /// Descriptors of the random device that are still open.
  static int openDevices();
};

#endif  // KELDOAUTH_TESTS_UTILS_KERNEL_H
