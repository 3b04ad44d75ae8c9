// Every operation of the floor, each on the same small
// household, in a form that a fault can be thrown into at any point.

#ifndef KELDOAUTH_TESTS_GRANTS_HOUSEHOLD_H
#define KELDOAUTH_TESTS_GRANTS_HOUSEHOLD_H

#include <functional>
#include <ostream>
#include <string>
#include <vector>

#include "tests/grants/grants_test.h"

namespace grants_test {

/// What the household's people and applications hold.
struct Household {
  ApplicationId frame, other;
  Code code;                // alice's for frame
  Code spentCode;           // long ago, for `old`
  RequestReference pushed;  // frame's
  Code quietCode;           // alice's for frame, without a page
  Pair old;                 // alice's with frame
  Pair replaced;            // bob's with other, refreshed since
  Pair current;             // what took its place
  AccessHandle handle;      // of `old`
};

struct Operation {
  std::string name;
  /// What it answers, as far as it is the same every time.
  std::function<std::string(Grants&, const Household&)> run;
};

inline void PrintTo(const Operation& operation, std::ostream* out) {
  *out << operation.name;
}

std::vector<Operation> everyChange();
std::vector<Operation> everyLookUp();

/// The fixture: a household in the file, which can be put back as it was.
class HouseholdTest : public GrantsTest {
 protected:
  void SetUp() override;

  /// File and clock as they were after SetUp; no connection is open then.
  void reset();

  /// What the file says now, the same for two runs of one operation: texts that
  /// were there in SetUp read "#old", others that were drawn "#new".
  [[nodiscard]] std::string state() const;

  Household household_;
  std::string before_;

 private:
  std::string file_;
  std::string seen_;
};

}  // namespace grants_test

#endif  // KELDOAUTH_TESTS_GRANTS_HOUSEHOLD_H
