#include "tests/load/processes.h"

#include <signal.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <system_error>
#include <vector>

namespace load {
namespace {

void check(int error, const char* what) {
  if (error != 0) throw std::system_error(error, std::generic_category(), what);
}

/// Nobody waits for a process whose parent was stopped from outside.
void dieWithParent(pid_t parent) {
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  if (getppid() != parent) _exit(1);
}

bool cameToItsEnd(pid_t process) {
  int status = 0;
  pid_t found = 0;
  do {
    found = waitpid(process, &status, 0);
  } while (found < 0 && errno == EINTR);
  return found == process && WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

}  // namespace

void* mapShared(std::size_t size) {
  void* memory = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
  check(memory == MAP_FAILED ? errno : 0, "mmap");
  return memory;
}

void unmapShared(void* memory, std::size_t size) {
  munmap(memory, size);
}

Barrier::Barrier(unsigned parties) {
  pthread_barrierattr_t shared;
  check(pthread_barrierattr_init(&shared), "pthread_barrierattr_init");
  check(pthread_barrierattr_setpshared(&shared, PTHREAD_PROCESS_SHARED), "pthread_barrierattr");
  check(pthread_barrier_init(&barrier_, &shared, parties), "pthread_barrier_init");
  pthread_barrierattr_destroy(&shared);
}

Barrier::~Barrier() {
  pthread_barrier_destroy(&barrier_);
}

void Barrier::wait() {
  pthread_barrier_wait(&barrier_);
}

int startProcess(const std::function<void()>& body) {
  std::fflush(nullptr);  // or every process would print what is buffered now
  const pid_t parent = getpid();
  const pid_t process = fork();
  check(process < 0 ? errno : 0, "fork");
  if (process > 0) return process;

  dieWithParent(parent);
  body();
  std::fflush(nullptr);
  _exit(0);  // whatever is left over belongs to the parent
}

bool runProcesses(int count, const std::function<void(int)>& body,
                  const std::function<void()>& parent) {
  std::vector<pid_t> processes;
  for (int number = 0; number < count; ++number) {
    processes.push_back(startProcess([&body, number] { body(number); }));
  }
  parent();
  bool allDone = true;
  for (const pid_t process : processes) allDone = cameToItsEnd(process) && allDone;
  return allDone;
}

bool hold(const Race& race) {
  const auto parties = static_cast<unsigned>(race.processes) + 1;
  Shared<Barrier> start(parties);
  Shared<Barrier> end(parties);

  const auto runner = [&](int number) {
    for (int round = 0; round < race.rounds; ++round) {
      start->wait();
      race.run(number);
      end->wait();
    }
  };
  const auto judge = [&] {
    for (int round = 0; round < race.rounds; ++round) {
      race.prepare();
      start->wait();
      end->wait();
      race.check();
    }
  };
  return runProcesses(race.processes, runner, judge);
}

}  // namespace load
