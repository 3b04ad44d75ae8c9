// Linked into a second copy of the command line: ends the process, as SIGKILL
// would, before the n-th step that reaches a disk, and does not wait for locks.
//   KELDOAUTH_DIE_AT    n; without it the program runs to its end
//   KELDOAUTH_DIE_TORN  when that step writes, half of it is written all the same
//   KELDOAUTH_MEANWHILE a line of the shell that runs before that step, instead
//                       of the end
//   KELDOAUTH_STEPS     a file that gets a line for each step
//   KELDOAUTH_HURRY     waiting takes no time

#include <dlfcn.h>
#include <fcntl.h>
#include <signal.h>
#include <sqlite3.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <climits>
#include <cstdlib>
#include <ctime>
#include <string>

namespace {

template <typename Function>
Function original(const char* name) {
  return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

#define ORIGINAL(name) original<decltype(&name)>(#name)

long number(const char* variable) {
  const char* text = std::getenv(variable);
  return text != nullptr ? std::atol(text) : 0;
}

std::string nameOf(int descriptor) {
  std::array<char, PATH_MAX> name{};
  const std::string link = "/proc/self/fd/" + std::to_string(descriptor);
  const ssize_t length = readlink(link.c_str(), name.data(), name.size());
  return length > 0 ? std::string(name.data(), static_cast<std::size_t>(length)) : "?";
}

void note(const std::string& step) {
  const char* record = std::getenv("KELDOAUTH_STEPS");
  if (record == nullptr) return;
  const int file = open(record, O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0600);
  const std::string line = step + "\n";
  static const auto put = ORIGINAL(write);
  if (put(file, line.data(), line.size()) < 0) std::abort();
  close(file);
}

[[noreturn]] void die() {
  for (;;) kill(getpid(), SIGKILL);
}

bool isAnotherActing() {
  const char* line = std::getenv("KELDOAUTH_MEANWHILE");
  if (line == nullptr) return false;
  if (std::system(line) != 0) std::abort();
  return true;
}

/// True when this is the step that is not to be.
bool isLast(const std::string& step) {
  static long count = 0;
  note(step);
  return ++count == number("KELDOAUTH_DIE_AT") && !isAnotherActing();
}

void step(const std::string& name) {
  if (isLast(name)) die();
}

template <typename Write>
void stepOfWriting(const std::string& name, Write writeHalf) {
  if (!isLast(name)) return;
  if (number("KELDOAUTH_DIE_TORN") != 0) writeHalf();
  die();
}

timespec skipped{};

// Under these names where time is longer than the system's own.
#if __TIMESIZE == 32 && defined(__USE_TIME_BITS64)
constexpr char kNanosleep[] = "__nanosleep64";
constexpr char kClockGettime[] = "__clock_gettime64";
#else
constexpr char kNanosleep[] = "nanosleep";
constexpr char kClockGettime[] = "clock_gettime";
#endif

}  // namespace

extern "C" {

ssize_t write(int file, const void* bytes, size_t size) {
  static const auto put = ORIGINAL(write);
  stepOfWriting("write " + nameOf(file), [=] { (void)!put(file, bytes, size / 2); });
  return put(file, bytes, size);
}

ssize_t pwrite64(int file, const void* bytes, size_t size, off64_t at) {
  static const auto put = ORIGINAL(pwrite64);
  stepOfWriting("write " + nameOf(file), [=] { (void)!put(file, bytes, size / 2, at); });
  return put(file, bytes, size, at);
}

int ftruncate64(int file, off64_t size) noexcept {
  step("truncate " + nameOf(file));
  return ORIGINAL(ftruncate64)(file, size);
}

int fsync(int file) {
  step("sync " + nameOf(file));
  return ORIGINAL(fsync)(file);
}

int fdatasync(int file) {
  step("sync " + nameOf(file));
  return ORIGINAL(fdatasync)(file);
}

int fchmod(int file, mode_t mode) noexcept {
  step("chmod " + nameOf(file));
  return ORIGINAL(fchmod)(file, mode);
}

int unlink(const char* path) noexcept {
  step(std::string("unlink ") + path);
  return ORIGINAL(unlink)(path);
}

int link(const char* from, const char* to) noexcept {
  step(std::string("link ") + to);
  return ORIGINAL(link)(from, to);
}

int rename(const char* from, const char* to) noexcept {
  step(std::string("rename ") + to);
  return ORIGINAL(rename)(from, to);
}

int renameat2(int fromFolder, const char* from, int toFolder, const char* to,
              unsigned flags) noexcept {
  step(std::string("rename ") + to);
  return ORIGINAL(renameat2)(fromFolder, from, toFolder, to, flags);
}

int mkostemp(char* name, int flags) {
  step("create");
  return ORIGINAL(mkostemp)(name, flags);
}

/// Every row that changes, long before it reaches the disk.
int sqlite3_exec(sqlite3* db, const char* sql, sqlite3_callback callback, void* arg, char** error) {
  step("statement");
  return ORIGINAL(sqlite3_exec)(db, sql, callback, arg, error);
}

int nanosleep(const timespec* duration, timespec* remaining) {
  static const auto sleep = original<decltype(&nanosleep)>(kNanosleep);
  if (number("KELDOAUTH_HURRY") == 0) return sleep(duration, remaining);
  skipped.tv_sec += 1;
  return 0;
}

int clock_gettime(clockid_t clock, timespec* now) noexcept {
  static const auto read = original<decltype(&clock_gettime)>(kClockGettime);
  const int result = read(clock, now);
  if (clock == CLOCK_MONOTONIC) now->tv_sec += skipped.tv_sec;
  return result;
}

}  // extern "C"
