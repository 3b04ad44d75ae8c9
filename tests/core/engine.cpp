#include "tests/core/engine.h"

#include <dlfcn.h>
#include <sqlite3.h>
#include <sys/stat.h>

#include <cerrno>
#include <ctime>
#include <utility>

#include "tests/support/allocations.h"

namespace {

struct EngineState {
  int opened = 0;
  int closed = 0;
  std::function<void(int)> onOpen;
  std::function<void(int)> onClose;
  std::function<void(const std::string&)> onExec;
  int closeAnswer = SQLITE_OK;
  std::string refusedStart;
  int refusal = SQLITE_OK;
};
EngineState engine;

struct CreationState {
  int attempts = 0;
  std::function<void(int)> before;
  std::function<void()> after;
  int error = 0;
  int refusals = 0;
};
CreationState creation;

struct WaitingState {
  std::function<void(int)> onNap;
  timespec start{};  // of the standing clock
  int naps = 0;
  long long napped = 0;
};
WaitingState waiting;

constexpr long long kNanoseconds = 1000000000;

/// What the C library calls its functions for this program's time_t.
#if __TIMESIZE == 32 && defined(__USE_TIME_BITS64)
constexpr char kClockGettime[] = "__clock_gettime64";
constexpr char kNanosleep[] = "__nanosleep64";
#else
constexpr char kClockGettime[] = "clock_gettime";
constexpr char kNanosleep[] = "nanosleep";
#endif

/// SQLite's functions go by another name where SQLite is part of this program.
template <typename Function>
Function original(const char* name) {
  const support::Uncounted uncounted;
  void* function = dlsym(RTLD_NEXT, name);
  if (function == nullptr) {
    function = dlsym(RTLD_DEFAULT, ("built_in_" + std::string(name)).c_str());
  }
  return reinterpret_cast<Function>(function);
}

int realClock(clockid_t clock, timespec* now) {
  static const auto real = original<decltype(&clock_gettime)>(kClockGettime);
  return real(clock, now);
}

timespec later(timespec start, long long nanoseconds) {
  const long long sum = start.tv_nsec + nanoseconds;
  start.tv_sec += static_cast<time_t>(sum / kNanoseconds);
  start.tv_nsec = static_cast<long>(sum % kNanoseconds);
  return start;
}

template <typename Hook, typename Argument>
void call(const Hook& hook, const Argument& argument) {
  if (hook) hook(argument);
}

bool isRefused(const char* sql) {
  return !engine.refusedStart.empty() &&
         std::string(sql).compare(0, engine.refusedStart.size(), engine.refusedStart) == 0;
}

}  // namespace

void Engine::release() {
  engine = {};
}
int Engine::opened() {
  return engine.opened;
}
int Engine::closed() {
  return engine.closed;
}
void Engine::onOpen(std::function<void(int)> hook) {
  engine.onOpen = std::move(hook);
}
void Engine::onClose(std::function<void(int)> hook) {
  engine.onClose = std::move(hook);
}
void Engine::onExec(std::function<void(const std::string&)> hook) {
  engine.onExec = std::move(hook);
}
void Engine::answerClose(int code) {
  engine.closeAnswer = code;
}
void Engine::refuseExec(const std::string& start, int code) {
  engine.refusedStart = start;
  engine.refusal = code;
}

void Creation::release() {
  creation = {};
}
int Creation::attempts() {
  return creation.attempts;
}
void Creation::before(std::function<void(int)> hook) {
  creation.before = std::move(hook);
}
void Creation::after(std::function<void()> hook) {
  creation.after = std::move(hook);
}
void Creation::refuse(int error, int times) {
  creation.error = error;
  creation.refusals = times;
}

void Waiting::release() {
  waiting = {};
}
void Waiting::onNap(std::function<void(int)> hook) {
  realClock(CLOCK_MONOTONIC, &waiting.start);
  waiting.onNap = std::move(hook);
}
int Waiting::naps() {
  return waiting.naps;
}
long long Waiting::napped() {
  return waiting.napped;
}

extern "C" {

int sqlite3_open(const char* path, sqlite3** db) {
  const int error = errno;
  ++engine.opened;
  call(engine.onOpen, error);
  return original<decltype(&sqlite3_open)>("sqlite3_open")(path, db);
}

int sqlite3_close(sqlite3* db) {
  const int error = errno;
  ++engine.closed;
  call(engine.onClose, error);
  const int result = original<decltype(&sqlite3_close)>("sqlite3_close")(db);
  return engine.closeAnswer != SQLITE_OK ? engine.closeAnswer : result;
}

int sqlite3_exec(sqlite3* db, const char* sql, int (*callback)(void*, int, char**, char**),
                 void* arg, char** text) {
  {
    const support::Uncounted uncounted;
    if (engine.onExec) engine.onExec(sql);
    if (isRefused(sql)) return engine.refusal;
  }
  static const auto real = original<decltype(&sqlite3_exec)>("sqlite3_exec");
  return real(db, sql, callback, arg, text);
}

int mknod(const char* path, mode_t mode, dev_t device) noexcept {
  ++creation.attempts;
  call(creation.before, creation.attempts);
  if (creation.refusals > 0) {
    --creation.refusals;
    errno = creation.error;
    return -1;
  }
  const int result = original<decltype(&mknod)>("mknod")(path, mode, device);
  if (result == 0 && creation.after) creation.after();
  return result;
}

int nanosleep(const timespec* duration, timespec* remaining) {
  if (!waiting.onNap) return original<decltype(&nanosleep)>(kNanosleep)(duration, remaining);
  ++waiting.naps;
  waiting.napped += static_cast<long long>(duration->tv_sec) * kNanoseconds + duration->tv_nsec;
  waiting.onNap(waiting.naps);
  return 0;
}

int clock_gettime(clockid_t clock, timespec* now) noexcept {
  if (clock == CLOCK_MONOTONIC && waiting.onNap) {
    *now = later(waiting.start, waiting.napped);
    return 0;
  }
  return realClock(clock, now);
}

}  // extern "C"
