// The fixture of the load programs: a crowd of visitors, and whether the file
// holds what they were told that it does.

#ifndef KELDOAUTH_TESTS_LOAD_CROWD_H
#define KELDOAUTH_TESTS_LOAD_CROWD_H

#include <set>
#include <string>

#include "tests/load/ledger.h"
#include "tests/support/world.h"

namespace load {

struct Size {
  int processes;
  int rounds;  // of each
};

/// The two crowds, in the form that was asked for.
Size fewBusyProcesses();
Size manyProcesses();

class Crowd : public support::World {
 protected:
  /// Settings that let every row in.
  void SetUp() override;

  /// Lets so many visitors in at once and returns what they saw together.
  static Ledger visit(Size size);

  /// Every acknowledged row, no other, and a sound file. To be called when all
  /// visitors are gone; removes what has expired.
  static void expectAsAcknowledged(const Ledger& ledger);

  /// One audit entry for every application.
  static void expectAuditComplete();

  static void report(const Ledger& ledger);
};

}  // namespace load

#endif  // KELDOAUTH_TESTS_LOAD_CROWD_H
