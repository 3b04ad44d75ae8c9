// Memory that runs out. Linking this file replaces operator new and, where no
// sanitizer does so already, malloc for the whole process.

#ifndef KELDOAUTH_TESTS_FAULTS_FAILING_MEMORY_H
#define KELDOAUTH_TESTS_FAULTS_FAILING_MEMORY_H

#include "tests/faults/trials.h"

namespace faults {

/// Who asks for it.
enum class Memory {
  kSqlite,  // SQLite, through its own allocator
  kNew,     // operator new
  kMalloc,  // anyone else who calls malloc: JsonCpp for its texts
};

class FailingMemory : public Fault {
 public:
  explicit FailingMemory(Memory memory) : memory_(memory) {}

  /// Takes the place of SQLite's allocator. No connection may be open.
  static void install();

  /// Blocks from operator new that are in use.
  static long blocks();

  void arm(int nth, bool lasting) override;
  void disarm() override;
  [[nodiscard]] bool struck() const override;
  [[nodiscard]] int code() const override;

 private:
  Memory memory_;
};

}  // namespace faults

#endif  // KELDOAUTH_TESTS_FAULTS_FAILING_MEMORY_H
