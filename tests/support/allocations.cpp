#include "tests/support/allocations.h"

#include <cstddef>
#include <cstdlib>
#include <new>

namespace support {
namespace {

thread_local int allocationsLeft = 0;  // until the failing one; 0 is none to come
thread_local bool failureHappened = false;

bool isTheFailingOne() {
  if (allocationsLeft == 0 || Uncounted::depth > 0) return false;
  if (--allocationsLeft > 0) return false;
  failureHappened = true;
  return true;
}

}  // namespace

FailingAllocation::FailingAllocation(int nth) {
  failureHappened = false;
  allocationsLeft = nth;
}

FailingAllocation::~FailingAllocation() {
  allocationsLeft = 0;
}

bool FailingAllocation::happened() {
  return failureHappened;
}

}  // namespace support

void* operator new(std::size_t size) {
  void* const memory = support::isTheFailingOne() ? nullptr : std::malloc(size > 0 ? size : 1);
  if (memory == nullptr) throw std::bad_alloc();
  return memory;
}

void operator delete(void* memory) noexcept {
  std::free(memory);
}

void operator delete(void* memory, std::size_t /*size*/) noexcept {
  std::free(memory);
}
