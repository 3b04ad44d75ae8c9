// Linked into a second copy of the command line: ends the process, as SIGKILL
// would, before the n-th step that reaches a disk, or lets that step fail, and
// does not wait for locks.
//   KELDOAUTH_DIE_AT    n; without it the program runs to its end
//   KELDOAUTH_DIE_TORN  when that step writes, half of it is written all the same
//   KELDOAUTH_MEANWHILE a line of the shell that runs before that step, instead
//                       of the end
//   KELDOAUTH_FAIL      what becomes of that step instead: "undone" or "done", and
//                       in either case it reports an error of the disk
//   KELDOAUTH_NO_FOLDER_SYNC  every sync of a folder fails
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
#include <cerrno>
#include <climits>
#include <cstdarg>
#include <cstdlib>
#include <ctime>
#include <string>

namespace {

template <typename Function>
Function original(const char* name) {
  return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

#define ORIGINAL(name) original<decltype(&name)>(#name)

/// The argument that only some calls have.
#define GET_MODE                                                    \
  mode_t mode = 0;                                                  \
  if ((flags & O_CREAT) != 0 || (flags & O_TMPFILE) == O_TMPFILE) { \
    va_list arguments;                                              \
    va_start(arguments, flags);                                     \
    mode = static_cast<mode_t>(va_arg(arguments, unsigned int));    \
    va_end(arguments);                                              \
  }

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
  static const auto openRecord = ORIGINAL(open64);
  const int file = openRecord(record, O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0600);
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

bool isFolder(int descriptor) {
  struct stat status {};
  return fstat(descriptor, &status) == 0 && S_ISDIR(status.st_mode);
}

/// True when this is the step that is not to be.
bool isLast(const std::string& step) {
  static long count = 0;
  note(step);
  return ++count == number("KELDOAUTH_DIE_AT") && !isAnotherActing();
}

/// Takes a step, or dies, or reports what did not happen, or not so.
template <typename Take>
auto step(const std::string& name, Take take) -> decltype(take()) {
  if (!isLast(name)) return take();
  const char* const failure = std::getenv("KELDOAUTH_FAIL");
  if (failure == nullptr) die();
  if (std::string(failure) == "done") take();
  errno = EIO;
  return -1;
}

template <typename Write>
ssize_t stepOfWriting(int file, size_t size, Write write) {
  if (!isLast("write " + nameOf(file))) return write(size);
  const char* const failure = std::getenv("KELDOAUTH_FAIL");
  const bool isDone = failure != nullptr && std::string(failure) == "done";
  if (number("KELDOAUTH_DIE_TORN") != 0) (void)!write(size / 2);
  if (failure == nullptr) die();
  if (isDone) (void)!write(size);
  errno = EIO;
  return -1;
}

int stepOfSyncing(int file, int (*sync)(int)) {
  if (isFolder(file) && number("KELDOAUTH_NO_FOLDER_SYNC") != 0) {
    note("sync " + nameOf(file));
    errno = EIO;
    return -1;
  }
  return step("sync " + nameOf(file), [=] { return sync(file); });
}

/// Only what makes a file is a step.
template <typename Open>
int stepOfOpening(const char* path, int flags, Open open) {
  const bool makes = (flags & O_CREAT) != 0 || (flags & O_TMPFILE) == O_TMPFILE;
  return makes ? step(std::string("create ") + path, open) : open();
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
  return stepOfWriting(file, size, [=](size_t part) { return put(file, bytes, part); });
}

ssize_t pwrite64(int file, const void* bytes, size_t size, off64_t at) {
  static const auto put = ORIGINAL(pwrite64);
  return stepOfWriting(file, size, [=](size_t part) { return put(file, bytes, part, at); });
}

int ftruncate64(int file, off64_t size) noexcept {
  return step("truncate " + nameOf(file), [=] { return ORIGINAL(ftruncate64)(file, size); });
}

int fsync(int file) {
  return stepOfSyncing(file, ORIGINAL(fsync));
}

int fdatasync(int file) {
  return stepOfSyncing(file, ORIGINAL(fdatasync));
}

int fchmod(int file, mode_t mode) noexcept {
  return step("chmod " + nameOf(file), [=] { return ORIGINAL(fchmod)(file, mode); });
}

int unlink(const char* path) noexcept {
  return step(std::string("unlink ") + path, [=] { return ORIGINAL(unlink)(path); });
}

int linkat(int fromFolder, const char* from, int toFolder, const char* to, int flags) noexcept {
  return step(std::string("link ") + to,
              [=] { return ORIGINAL(linkat)(fromFolder, from, toFolder, to, flags); });
}

int rename(const char* from, const char* to) noexcept {
  return step(std::string("rename ") + to, [=] { return ORIGINAL(rename)(from, to); });
}

int open64(const char* path, int flags, ...) {
  GET_MODE;
  return stepOfOpening(path, flags, [=] { return ORIGINAL(open64)(path, flags, mode); });
}

int openat64(int folder, const char* path, int flags, ...) {
  GET_MODE;
  return stepOfOpening(path, flags, [=] { return ORIGINAL(openat64)(folder, path, flags, mode); });
}

// Where offsets have 64 bits anyway, these are other names of the same.
#ifndef __USE_FILE_OFFSET64

ssize_t pwrite(int file, const void* bytes, size_t size, off_t at) {
  static const auto put = ORIGINAL(pwrite);
  return stepOfWriting(file, size, [=](size_t part) { return put(file, bytes, part, at); });
}

int ftruncate(int file, off_t size) noexcept {
  return step("truncate " + nameOf(file), [=] { return ORIGINAL(ftruncate)(file, size); });
}

int open(const char* path, int flags, ...) {
  GET_MODE;
  return stepOfOpening(path, flags, [=] { return ORIGINAL(open)(path, flags, mode); });
}

int openat(int folder, const char* path, int flags, ...) {
  GET_MODE;
  return stepOfOpening(path, flags, [=] { return ORIGINAL(openat)(folder, path, flags, mode); });
}

#endif

int getentropy(void* bytes, size_t size) {
  return step("draw", [=] { return ORIGINAL(getentropy)(bytes, size); });
}

/// Every row that changes, long before it reaches the disk.
int sqlite3_exec(sqlite3* db, const char* sql, sqlite3_callback callback, void* arg, char** error) {
  if (isLast("statement") && std::getenv("KELDOAUTH_FAIL") == nullptr) die();
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
