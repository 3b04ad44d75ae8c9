// Memory that runs out at a chosen allocation. Programs that want it link
// test_allocations, which replaces operator new for the whole process.

#ifndef KELDOAUTH_TESTS_SUPPORT_ALLOCATIONS_H
#define KELDOAUTH_TESTS_SUPPORT_ALLOCATIONS_H

namespace support {

/// While it lives, one operator new of this thread throws std::bad_alloc: the
/// n-th (1 is the next). Those before and after it succeed.
class FailingAllocation {
 public:
  explicit FailingAllocation(int nth);
  ~FailingAllocation();
  FailingAllocation(const FailingAllocation&) = delete;
  FailingAllocation& operator=(const FailingAllocation&) = delete;

  /// Whether it came to that allocation, before or after the end of the scope.
  static bool happened();
};

/// What the doubles allocate within the scope is not the library's.
class Uncounted {
 public:
  Uncounted() { ++depth; }
  ~Uncounted() { --depth; }
  Uncounted(const Uncounted&) = delete;
  Uncounted& operator=(const Uncounted&) = delete;

  static inline thread_local int depth = 0;
};

/// Runs `operation` again and again, each time with a later allocation failing,
/// until it gets by without one; calls `check` after each run that met the
/// failure. Returns how many did.
template <typename Operation, typename Check>
int failEachAllocation(Operation operation, Check check) {
  for (int nth = 1;; ++nth) {
    {
      const FailingAllocation failing(nth);
      operation();
    }
    if (!FailingAllocation::happened()) return nth - 1;
    check(nth);
  }
}

}  // namespace support

#endif  // KELDOAUTH_TESTS_SUPPORT_ALLOCATIONS_H
