// The operations of the stores that take texts, each callable with the
// arguments that a test wants different from the usual ones.

#ifndef KELDOAUTH_TESTS_STORES_OPERATIONS_H
#define KELDOAUTH_TESTS_STORES_OPERATIONS_H

#include <json/value.h>

#include <functional>
#include <iosfwd>
#include <string>
#include <vector>

#include "tests/stores/store_test.h"

/// Arguments by the names of their columns.
using Texts = support::Row;

Outcome addClient(const Texts& changes, Json::Value& out);
Outcome addClient(const Texts& changes = {});
Outcome addGeneratedClient(const Texts& changes, Json::Value& out);  // both generated
Outcome addClientWithSecret(const Texts& changes, Json::Value& out);
Outcome editClient(long long id, const Texts& changes = {});

Outcome addCode(const Texts& changes, Json::Value& out);
Outcome addCode(const Texts& changes = {});
Outcome issueCode(const Texts& changes, Json::Value& out);  // code and expiry generated
Outcome issueCode(const Texts& changes = {});
Outcome editCode(long long id, const Texts& changes = {});
Outcome editCodeAndExpiry(long long id, const Texts& changes = {});

Outcome addToken(const Texts& changes, Json::Value& out);
Outcome addToken(const Texts& changes = {});
Outcome issueToken(const Texts& changes, Json::Value& out);  // tokens and expiry generated
Outcome issueToken(const Texts& changes = {});
Outcome editToken(long long id, const Texts& changes = {});
Outcome editTokenAndExpiry(long long id, const Texts& changes = {});

/// How the file holds an argument that an operation was given; kGenerated marks
/// one that it checks, but does not get.
enum class Stored { kDoubled, kAsGiven, kNever, kGenerated };

struct Argument {
  std::string name;
  std::size_t min;
  std::size_t max;
  Stored stored = Stored::kDoubled;
};

/// One that refuses texts of the wrong length. Its arguments stand in the order
/// in which they are checked.
struct Operation {
  std::string name;
  std::string table;
  std::vector<Argument> arguments;
  int refusalCode;      // kCodeBefore for a refusal that sets none
  std::string refusal;  // the line
  std::string row;      // the id of the row that it writes; empty for a look-up
  std::function<Outcome(const Texts& changes, Json::Value& out)> run;

  [[nodiscard]] std::string refusalMessage() const {
    return refusalCode == kCodeBefore ? kMessageBefore : "Bad parameters";
  }
};
void PrintTo(const Operation& operation, std::ostream* out);

const std::vector<Operation>& operations();

/// Every argument that an operation gets.
struct OperationArgument {
  Operation operation;
  Argument argument;
};
/// Names the cases of a table.
void PrintTo(const OperationArgument& argument, std::ostream* out);

std::vector<OperationArgument> operationArguments();

/// A world in which every operation finds what it works on: in each table one
/// row with id 1, which the look-ups find, and one with id 2.
class OperationsTest : public StoreTest {
 protected:
  void SetUp() override;
  /// The same world again, as if nothing had been done to it.
  static void startAfresh();
};

/// "A text of this many bytes."
std::string textOf(std::size_t bytes);

#endif  // KELDOAUTH_TESTS_STORES_OPERATIONS_H
