#include "tests/faults/failing_memory.h"

#include <sqlite3.h>

#include <atomic>
#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <new>

#include "tests/support/allocations.h"

namespace faults {
namespace {

struct Plan {
  Memory memory = Memory::kNew;
  int left = 0;  // until the failing allocation; 0: none fails
  bool lasting = false;
  bool struck = false;
};
thread_local Plan plan;

/// Above 0 while operator new or SQLite's allocator gets its memory.
thread_local int inside = 0;

class Inside {
 public:
  Inside() { ++inside; }
  ~Inside() { --inside; }
  Inside(const Inside&) = delete;
  Inside& operator=(const Inside&) = delete;
};

std::atomic<long> usedBlocks{0};

bool fails(Memory memory) {
  if (plan.left == 0 || memory != plan.memory || support::Uncounted::depth > 0) return false;
  if (plan.left > 1) {
    --plan.left;
    return false;
  }
  plan.struck = true;
  if (!plan.lasting) plan.left = 0;
  return true;
}

sqlite3_mem_methods realSqlite;

void* allocateForSqlite(int size) {
  const Inside mark;
  return fails(Memory::kSqlite) ? nullptr : realSqlite.xMalloc(size);
}

void* resizeForSqlite(void* memory, int size) {
  const Inside mark;
  return fails(Memory::kSqlite) ? nullptr : realSqlite.xRealloc(memory, size);
}

}  // namespace

void FailingMemory::install() {
  if (realSqlite.xMalloc != nullptr) return;
  sqlite3_shutdown();
  sqlite3_config(SQLITE_CONFIG_GETMALLOC, &realSqlite);
  sqlite3_mem_methods failing = realSqlite;
  failing.xMalloc = allocateForSqlite;
  failing.xRealloc = resizeForSqlite;
  sqlite3_config(SQLITE_CONFIG_MALLOC, &failing);
  sqlite3_initialize();
}

long FailingMemory::blocks() {
  return usedBlocks;
}

void FailingMemory::arm(int nth, bool lasting) {
  plan = {memory_, nth, lasting, false};
}

void FailingMemory::disarm() {
  plan.left = 0;
}

bool FailingMemory::struck() const {
  return plan.struck;
}

int FailingMemory::code() const {
  return SQLITE_NOMEM;
}

}  // namespace faults

void* operator new(std::size_t size) {
  const faults::Inside mark;
  void* const memory =
      faults::fails(faults::Memory::kNew) ? nullptr : std::malloc(size > 0 ? size : 1);
  if (memory == nullptr) throw std::bad_alloc();
  ++faults::usedBlocks;
  return memory;
}

void operator delete(void* memory) noexcept {
  if (memory != nullptr) --faults::usedBlocks;
  std::free(memory);
}

void operator delete(void* memory, std::size_t /*size*/) noexcept {
  operator delete(memory);
}

#if !defined(__SANITIZE_ADDRESS__) && !defined(__SANITIZE_THREAD__)

extern "C" {

void* __libc_malloc(std::size_t size);

void* malloc(std::size_t size) {
  if (faults::inside == 0 && faults::fails(faults::Memory::kMalloc)) {
    errno = ENOMEM;
    return nullptr;
  }
  return __libc_malloc(size);
}

}  // extern "C"

#endif
