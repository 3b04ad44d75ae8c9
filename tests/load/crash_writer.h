// The process that is killed: it changes the file without end and tells its
// parent of each operation before and after.

#ifndef KELDOAUTH_TESTS_LOAD_CRASH_WRITER_H
#define KELDOAUTH_TESTS_LOAD_CRASH_WRITER_H

#include "tests/load/crash_model.h"

namespace load {

enum class News { kBegins, kSucceeded, kFailed };

/// What comes through the pipe, whole or not at all.
struct Message {
  News news;
  Operation operation;
};

/// Draws and performs operations on the file, which holds `state`, and writes
/// messages to `pipe`. Ends only when it cannot tell any more.
void writeForEver(int pipe, State state, int serial, unsigned seed);

}  // namespace load

#endif  // KELDOAUTH_TESTS_LOAD_CRASH_WRITER_H
