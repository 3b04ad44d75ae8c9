// Many processes at once, and what they share.

#ifndef KELDOAUTH_TESTS_LOAD_PROCESSES_H
#define KELDOAUTH_TESTS_LOAD_PROCESSES_H

#include <pthread.h>

#include <cstddef>
#include <functional>
#include <new>
#include <utility>

namespace load {

void* mapShared(std::size_t size);
void unmapShared(void* memory, std::size_t size);

/// An object in memory that processes forked later on share.
template <typename T>
class Shared {
 public:
  template <typename... Arguments>
  explicit Shared(Arguments&&... arguments)
      : object_(new (mapShared(sizeof(T))) T(std::forward<Arguments>(arguments)...)) {}
  ~Shared() {
    object_->~T();
    unmapShared(object_, sizeof(T));
  }
  Shared(const Shared&) = delete;
  Shared& operator=(const Shared&) = delete;

  T* operator->() { return object_; }
  const T* operator->() const { return object_; }

 private:
  T* object_;
};

/// Where `parties` processes wait until all of them are there. To be shared.
class Barrier {
 public:
  explicit Barrier(unsigned parties);
  ~Barrier();
  Barrier(const Barrier&) = delete;
  Barrier& operator=(const Barrier&) = delete;

  void wait();

 private:
  pthread_barrier_t barrier_;
};

/// Runs body(0), body(1) and so on up to `count` at the same time, each in a
/// process of its own, and `parent` in this one; waits for all of them. True
/// when every process came to the end of its body.
bool runProcesses(
    int count, const std::function<void(int)>& body, const std::function<void()>& parent = [] {});

/// A competition of `processes` over and over again. What they share is made
/// before; `prepare` and `check` run in this process, while the others wait.
struct Race {
  int processes;
  int rounds;
  std::function<void()> prepare;
  std::function<void(int)> run;  // in each process, all at the same moment
  std::function<void()> check;
};

/// True when every process came to its end.
bool hold(const Race& race);

/// Starts one process that runs `body` and returns its id.
int startProcess(const std::function<void()>& body);

}  // namespace load

#endif  // KELDOAUTH_TESTS_LOAD_PROCESSES_H
