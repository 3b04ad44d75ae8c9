// Loaded before a program of the service (LD_PRELOAD), to put it into a moment
// that nobody can wait for:
//
//   SERVICE_LATER=N     its clock is N seconds ahead
//   SERVICE_KILL_AT=N   it is killed right before the N-th change that it makes
//                       to any file; 1 is the first
//   SERVICE_REPLACE_AT=N, SERVICE_REPLACE_BY=PATH, SERVICE_REPLACED=PATH
//                       right before that change, the one file takes the name
//                       of the other
//
// The functions are named by their symbols: the system's headers give some of
// them other ones on some platforms.

#include <dlfcn.h>

#include <csignal>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <ctime>

namespace {

using Offset = long long;

long long numberOf(const char* variable) {
  const char* text = std::getenv(variable);
  return text == nullptr ? 0 : std::strtoll(text, nullptr, 10);
}

template <typename Function>
Function* next(const char* name) {
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

void step() {
  static long long left = numberOf("SERVICE_KILL_AT");
  static long long leftToReplace = numberOf("SERVICE_REPLACE_AT");
  if (left > 0 && --left == 0) std::raise(SIGKILL);
  if (leftToReplace > 0 && --leftToReplace == 0) {
    std::rename(std::getenv("SERVICE_REPLACE_BY"), std::getenv("SERVICE_REPLACED"));
  }
}

}  // namespace

extern "C" {

std::time_t time(std::time_t* into) noexcept {
  std::timespec now{};
  std::timespec_get(&now, TIME_UTC);
  const std::time_t later = now.tv_sec + static_cast<std::time_t>(numberOf("SERVICE_LATER"));
  if (into != nullptr) *into = later;
  return later;
}

long pwriteStep(int file, const void* bytes, std::size_t size, long at) asm("pwrite");
long pwriteStep(int file, const void* bytes, std::size_t size, long at) {
  step();
  return next<decltype(pwriteStep)>("pwrite")(file, bytes, size, at);
}

long pwrite64Step(int file, const void* bytes, std::size_t size, Offset at) asm("pwrite64");
long pwrite64Step(int file, const void* bytes, std::size_t size, Offset at) {
  step();
  return next<decltype(pwrite64Step)>("pwrite64")(file, bytes, size, at);
}

int ftruncateStep(int file, long size) asm("ftruncate");
int ftruncateStep(int file, long size) {
  step();
  return next<decltype(ftruncateStep)>("ftruncate")(file, size);
}

int ftruncate64Step(int file, Offset size) asm("ftruncate64");
int ftruncate64Step(int file, Offset size) {
  step();
  return next<decltype(ftruncate64Step)>("ftruncate64")(file, size);
}

int fsyncStep(int file) asm("fsync");
int fsyncStep(int file) {
  step();
  return next<decltype(fsyncStep)>("fsync")(file);
}

int fdatasyncStep(int file) asm("fdatasync");
int fdatasyncStep(int file) {
  step();
  return next<decltype(fdatasyncStep)>("fdatasync")(file);
}

int unlinkStep(const char* path) asm("unlink");
int unlinkStep(const char* path) {
  step();
  return next<decltype(unlinkStep)>("unlink")(path);
}
}
