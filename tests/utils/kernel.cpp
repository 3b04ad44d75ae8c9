#include "tests/utils/kernel.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <sys/random.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <map>
#include <mutex>
#include <set>
#include <utility>

#include "tests/support/allocations.h"

namespace {

std::mutex mutex;

struct State {
  std::map<std::string, int> opened;
  std::map<std::string, int> askedForAccess;
  int deviceError = 0;
  Kernel::Read device;
  Kernel::Read getrandom;
  std::vector<std::size_t> deviceReads;
  std::vector<std::size_t> getrandomCalls;
  std::set<int> devices;
  int reads = 0;
  std::function<void()> beforeRead;
};
State& state() {
  static State theState;
  return theState;
}

template <typename Function>
Function original(const char* name) {
  return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

template <typename Body>
auto withState(Body body) {
  const support::Uncounted uncounted;
  const std::lock_guard<std::mutex> lock(mutex);
  return body(state());
}

/// False when the path is refused, with errno set.
bool admit(const std::string& path) {
  const int error = withState([&](State& s) {
    ++s.opened[path];
    return path == Kernel::kRandomDevice ? s.deviceError : 0;
  });
  if (error != 0) errno = error;
  return error == 0;
}

/// Only a call that may create a file has a mode.
mode_t modeOf(int flags, va_list arguments) {
  return (flags & (O_CREAT | O_TMPFILE)) != 0 ? va_arg(arguments, mode_t) : 0;
}

int openFile(const char* name, const char* path, int flags, mode_t mode) {
  using Open = int (*)(const char*, int, ...);
  if (!admit(path)) return -1;
  const int descriptor = original<Open>(name)(path, flags, mode);
  if (path == std::string(Kernel::kRandomDevice)) {
    withState([&](State& s) { s.devices.insert(descriptor); });
  }
  return descriptor;
}

}  // namespace

void Kernel::release() {
  withState([](State& s) { s = {}; });
}
int Kernel::opened(const std::string& path) {
  return withState([&](State& s) { return s.opened[path]; });
}
int Kernel::askedForAccess(const std::string& path) {
  return withState([&](State& s) { return s.askedForAccess[path]; });
}
void Kernel::refuseRandomDevice(int error) {
  withState([&](State& s) { s.deviceError = error; });
}
void Kernel::scriptRandomDevice(Read read) {
  withState([&](State& s) { s.device = std::move(read); });
}
void Kernel::scriptGetrandom(Read read) {
  withState([&](State& s) { s.getrandom = std::move(read); });
}
std::vector<std::size_t> Kernel::deviceReads() {
  return withState([](State& s) { return s.deviceReads; });
}
std::vector<std::size_t> Kernel::getrandomCalls() {
  return withState([](State& s) { return s.getrandomCalls; });
}
int Kernel::reads() {
  return withState([](State& s) { return s.reads; });
}
void Kernel::beforeRead(std::function<void()> hook) {
  withState([&](State& s) { s.beforeRead = std::move(hook); });
}
int Kernel::openDevices() {
  return withState([](State& s) { return static_cast<int>(s.devices.size()); });
}

extern "C" {

/// Under the names that the linker knows: which of them `open` stands for is a
/// matter of the size of file offsets.
int openWithSmallOffsets(const char* path, int flags, ...) __asm__("open");
int openWithLargeOffsets(const char* path, int flags, ...) __asm__("open64");

int openWithSmallOffsets(const char* path, int flags, ...) {
  va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = modeOf(flags, arguments);
  va_end(arguments);
  return openFile("open", path, flags, mode);
}

int openWithLargeOffsets(const char* path, int flags, ...) {
  va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = modeOf(flags, arguments);
  va_end(arguments);
  return openFile("open64", path, flags, mode);
}

int close(int descriptor) {
  withState([&](State& s) { s.devices.erase(descriptor); });
  return original<decltype(&close)>("close")(descriptor);
}

ssize_t read(int descriptor, void* buffer, size_t size) {
  const auto hook = withState([](State& s) {
    ++s.reads;
    return s.beforeRead;
  });
  if (hook) hook();
  const Kernel::Read script = withState([&](State& s) {
    if (s.devices.count(descriptor) == 0) return Kernel::Read();
    s.deviceReads.push_back(size);
    return s.device;
  });
  if (script) return script(static_cast<char*>(buffer), size);
  return original<decltype(&read)>("read")(descriptor, buffer, size);
}

ssize_t getrandom(void* buffer, size_t size, unsigned int flags) {
  const Kernel::Read script = withState([&](State& s) {
    s.getrandomCalls.push_back(size);
    return s.getrandom;
  });
  if (script) return script(static_cast<char*>(buffer), size);
  return original<decltype(&getrandom)>("getrandom")(buffer, size, flags);
}

int access(const char* path, int mode) noexcept {
  withState([&](State& s) { ++s.askedForAccess[path]; });
  return original<decltype(&access)>("access")(path, mode);
}

}  // extern "C"
