#include "tests/core/engine.h"

#include <dlfcn.h>
#include <sqlite3.h>

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

struct WaitingState {
  std::function<void(int)> onNap;
  int naps = 0;
  long long napped = 0;
};
WaitingState waiting;

constexpr long long kNanoseconds = 1000000000;

template <typename Function>
Function original(const char* name) {
  return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
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

void Waiting::release() {
  waiting = {};
}
void Waiting::onNap(std::function<void(int)> hook) {
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

int nanosleep(const timespec* duration, timespec* remaining) {
  if (!waiting.onNap) return original<decltype(&nanosleep)>("nanosleep")(duration, remaining);
  ++waiting.naps;
  waiting.napped += static_cast<long long>(duration->tv_sec) * kNanoseconds + duration->tv_nsec;
  waiting.onNap(waiting.naps);
  return 0;
}

int clock_gettime(clockid_t clock, timespec* now) noexcept {
  static const auto real = original<decltype(&clock_gettime)>("clock_gettime");
  const int result = real(clock, now);
  if (clock != CLOCK_MONOTONIC || waiting.napped == 0) return result;

  const long long shifted =
      static_cast<long long>(now->tv_sec) * kNanoseconds + now->tv_nsec + waiting.napped;
  now->tv_sec = static_cast<time_t>(shifted / kNanoseconds);
  now->tv_nsec = static_cast<long>(shifted % kNanoseconds);
  return result;
}

}  // extern "C"
