// Every operation of every store, each on the same small household of rows, in
// a form that a fault can be thrown into at any point.

#ifndef KELDOAUTH_TESTS_FAULTS_EVERY_OPERATION_H
#define KELDOAUTH_TESTS_FAULTS_EVERY_OPERATION_H

#include <functional>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

#include "core/oauth_db_basic.h"

namespace faults {

/// The second in which every operation happens.
constexpr long long kNow = 1700000000;

/// What stands in the state folder before an operation.
enum class Household {
  kAbsent,           // no database file
  kComplete,         // two applications, four codes, four token pairs, five log entries
  kWithoutLogTable,  // the same, but for one table
  kWithoutMetaTable,
  kWithHotJournal,  // the same, as a process leaves it that dies within a transaction
  kWithFullLog,     // the same, with settings that allow no more than three log entries
};

/// What a caller learns from an operation.
struct Answer {
  bool success = false;
  std::string text;  // of what was read; empty for a change
};

struct Operation {
  std::string name;
  Household household;

  /// The object that is operated on. For an operation that is construction
  /// itself, `run` is empty and success means that the object is ready.
  std::function<std::shared_ptr<KELDOAUTHSERVER::OAUTHDBBasic>()> open;
  std::function<Answer(KELDOAUTHSERVER::OAUTHDBBasic&)> run;

  /// How many changes of the file it makes, each of them whole or not at all,
  /// and how many of those are there once it has reported success.
  int units;
  int promised;

  /// Draws identifiers of its own, so that no two runs leave the same rows.
  bool draws = false;

  /// A purge: a read that fails inside it counts as nothing to do, and so as
  /// success; a removal that fails by itself does not hold up the others.
  bool purges = false;

  [[nodiscard]] bool isConstruction() const { return !run; }
};

std::vector<Operation> everyOperation();

/// Those that write to the file when nothing goes wrong.
std::vector<Operation> everyWriter();

/// Those of a store that change rows, and those that only read.
std::vector<Operation> everyChange();
std::vector<Operation> everyLookUp();

/// Fills the state folder, with the clock at kNow afterwards.
void furnish(Household household);

bool isReady(KELDOAUTHSERVER::OAUTHDBBasic& store);

void PrintTo(const Operation& operation, std::ostream* out);

}  // namespace faults

#endif  // KELDOAUTH_TESTS_FAULTS_EVERY_OPERATION_H
