#include "tests/platform/system_calls.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdarg>
#include <cstdlib>
#include <utility>

namespace {

struct State {
  SystemCalls::Script script;
  bool oneByte = false;
  bool raised = false;
  std::vector<std::string> names;
};
State state;

/// 0 for going on, else -1 with errno set. Silent while no test listens, so
/// that the test program's own calls stay out.
int admit(const std::string& name) {
  if (!state.script) return 0;
  state.names.push_back(name);
  const int error = state.script(name);
  if (error == 0) return 0;
  errno = error;
  return -1;
}

size_t portion(size_t size) {
  return state.oneByte ? std::min<size_t>(size, 1) : size;
}

template <typename Function>
Function original(const char* name) {
  return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

bool isFolder(int descriptor) {
  struct stat status {};
  return fstat(descriptor, &status) == 0 && S_ISDIR(status.st_mode);
}

}  // namespace

void SystemCalls::follow(Script script) {
  state.names.clear();
  state.script = std::move(script);
}
void SystemCalls::fail(const std::string& name, int error) {
  follow([name, error](const std::string& called) { return called == name ? error : 0; });
}
void SystemCalls::stopAt(int nth) {
  follow([left = nth](const std::string&) mutable { return --left == 0 ? raise(SIGSTOP) : 0; });
}
void SystemCalls::moveOneByte() {
  state.oneByte = true;
}
void SystemCalls::raisePrivileges() {
  state.raised = true;
}
std::vector<std::string> SystemCalls::names() {
  return state.names;
}
void SystemCalls::release() {
  state = {};
}

extern "C" {

int getentropy(void* buffer, size_t size) {
  if (admit("getentropy") != 0) return -1;
  return original<decltype(&getentropy)>("getentropy")(buffer, size);
}

int fchmod(int descriptor, mode_t mode) noexcept {
  if (admit("fchmod") != 0) return -1;
  return original<int (*)(int, mode_t)>("fchmod")(descriptor, mode);
}

ssize_t write(int descriptor, const void* bytes, size_t size) {
  if (admit("write") != 0) return -1;
  return original<decltype(&write)>("write")(descriptor, bytes, portion(size));
}

ssize_t read(int descriptor, void* bytes, size_t size) {
  if (admit("read") != 0) return -1;
  return original<decltype(&read)>("read")(descriptor, bytes, portion(size));
}

int fsync(int descriptor) {
  if (admit(state.script && isFolder(descriptor) ? "fsync folder" : "fsync") != 0) return -1;
  return original<decltype(&fsync)>("fsync")(descriptor);
}

int linkat(int fromFolder, const char* from, int toFolder, const char* to, int flags) noexcept {
  if (admit("linkat") != 0) return -1;
  return original<int (*)(int, const char*, int, const char*, int)>("linkat")(fromFolder, from,
                                                                              toFolder, to, flags);
}

/// The stand-ins are built with 64-bit offsets.
int open64(const char* path, int flags, ...) {
  mode_t mode = 0;
  if ((flags & (O_CREAT | O_TMPFILE)) != 0) {
    va_list arguments;
    va_start(arguments, flags);
    mode = va_arg(arguments, mode_t);
    va_end(arguments);
  }
  if ((flags & O_TMPFILE) == O_TMPFILE && admit("O_TMPFILE") != 0) return -1;
  return original<int (*)(const char*, int, ...)>("open64")(path, flags, mode);
}

int unlink(const char* path) noexcept {
  if (admit("unlink") != 0) return -1;
  return original<int (*)(const char*)>("unlink")(path);
}

char* secure_getenv(const char* name) noexcept {
  return state.raised ? nullptr : original<char* (*)(const char*)>("secure_getenv")(name);
}

}  // extern "C"
