#include "tests/signing/calls.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <utility>

namespace {

struct Watch {
  signing_test::Calls::Script script;
  bool oneByte = false;
  std::vector<std::string> names;
};
Watch watch;

/// 0 for going on, else -1 with errno set. Silent while no test listens.
int admit(const std::string& name) {
  if (!watch.script) return 0;
  watch.names.push_back(name);
  const int error = watch.script(name);
  if (error == 0) return 0;
  errno = error;
  return -1;
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

namespace signing_test {

void Calls::follow(Script script) {
  watch.names.clear();
  watch.script = std::move(script);
}
void Calls::fail(const std::string& name, int error) {
  follow([name, error](const std::string& called) { return called == name ? error : 0; });
}
void Calls::writeOneByte() {
  watch.oneByte = true;
}
std::vector<std::string> Calls::names() {
  return watch.names;
}
void Calls::release() {
  watch = {};
}

}  // namespace signing_test

extern "C" {

int getentropy(void* buffer, size_t size) {
  if (admit("getentropy") != 0) return -1;
  return original<decltype(&getentropy)>("getentropy")(buffer, size);
}

int fchown(int descriptor, uid_t owner, gid_t group) noexcept {
  if (admit("fchown") != 0) return -1;
  return original<int (*)(int, uid_t, gid_t)>("fchown")(descriptor, owner, group);
}

int fchmod(int descriptor, mode_t mode) noexcept {
  if (admit("fchmod") != 0) return -1;
  return original<int (*)(int, mode_t)>("fchmod")(descriptor, mode);
}

ssize_t write(int descriptor, const void* bytes, size_t size) {
  if (admit("write") != 0) return -1;
  const size_t portion = watch.oneByte ? std::min<size_t>(size, 1) : size;
  return original<decltype(&write)>("write")(descriptor, bytes, portion);
}

int fsync(int descriptor) {
  if (admit(watch.script && isFolder(descriptor) ? "fsync folder" : "fsync") != 0) return -1;
  return original<decltype(&fsync)>("fsync")(descriptor);
}

int link(const char* from, const char* to) noexcept {
  if (admit("link") != 0) return -1;
  return original<int (*)(const char*, const char*)>("link")(from, to);
}

int rename(const char* from, const char* to) noexcept {
  if (admit("rename") != 0) return -1;
  return original<int (*)(const char*, const char*)>("rename")(from, to);
}

int unlink(const char* path) noexcept {
  if (admit("unlink") != 0) return -1;
  return original<int (*)(const char*)>("unlink")(path);
}

int flock(int descriptor, int operation) noexcept {
  if (admit("flock") != 0) return -1;
  return original<int (*)(int, int)>("flock")(descriptor, operation);
}

/// All code here is compiled for large files.
int open64(const char* path, int flags, ...) {
  mode_t mode = 0;
  if ((flags & O_CREAT) != 0) {
    va_list arguments;
    va_start(arguments, flags);
    mode = va_arg(arguments, mode_t);
    va_end(arguments);
    if (admit("create") != 0) return -1;
  }
  return original<int (*)(const char*, int, ...)>("open64")(path, flags, mode);
}

}  // extern "C"
