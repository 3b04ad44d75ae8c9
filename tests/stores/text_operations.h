// The operations of the stores that take texts, each callable with the
// arguments that a test wants different from the usual ones.

#ifndef KELDOAUTH_TESTS_STORES_TEXT_OPERATIONS_H
#define KELDOAUTH_TESTS_STORES_TEXT_OPERATIONS_H

#include <json/value.h>

#include <functional>
#include <iosfwd>
#include <string>
#include <vector>

#include "tests/stores/store_test.h"

/// Arguments by the names of their columns.
using Texts = support::Row;

Aftermath addClient(const Texts& changes, Json::Value& out);
Aftermath addClient(const Texts& changes = {});
Aftermath addGeneratedClient(const Texts& changes, Json::Value& out);  // both generated
Aftermath addClientWithSecret(const Texts& changes, Json::Value& out);
Aftermath editClient(long long id, const Texts& changes = {});

Aftermath addCode(const Texts& changes, Json::Value& out);
Aftermath addCode(const Texts& changes = {});
Aftermath issueCode(const Texts& changes, Json::Value& out);  // code and expiry generated
Aftermath issueCode(const Texts& changes = {});
Aftermath editCode(long long id, const Texts& changes = {});
Aftermath editCodeAndExpiry(long long id, const Texts& changes = {});

Aftermath addToken(const Texts& changes, Json::Value& out);
Aftermath addToken(const Texts& changes = {});
Aftermath issueToken(const Texts& changes, Json::Value& out);  // tokens and expiry generated
Aftermath issueToken(const Texts& changes = {});
Aftermath editToken(long long id, const Texts& changes = {});
Aftermath editTokenAndExpiry(long long id, const Texts& changes = {});

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
  std::function<Aftermath(const Texts& changes, Json::Value& out)> run;

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

#endif  // KELDOAUTH_TESTS_STORES_TEXT_OPERATIONS_H
