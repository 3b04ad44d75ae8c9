// What the file must hold, worked out without the library and without SQLite.

#ifndef KELDOAUTH_TESTS_LOAD_CRASH_MODEL_H
#define KELDOAUTH_TESTS_LOAD_CRASH_MODEL_H

#include <iosfwd>
#include <map>
#include <random>
#include <string>
#include <vector>

#include "tests/support/world.h"

namespace load {

/// The second in which everything happens.
constexpr long long kNow = 1700000000;

enum class Action {
  kRegisterClient,
  kDisableClient,
  kRemoveClient,
  kIssueCode,
  kIssueExpiredCode,
  kEditCode,
  kRevokeCode,
  kRedeemCode,
  kPurgeCodes,
  kIssueTokens,
  kIssueExpiredTokens,
  kRevokeTokens,
  kPurgeTokens,
  kWriteLog,
  kClearLog,
};

/// One call of the library. All texts in it follow from `serial`, which is that
/// of a new row, or of the row that the call is about.
struct Operation {
  Action action;
  int serial;
};

/// The texts of the row with this serial.
namespace texts {
std::string identifier(int serial);  // 64 characters
std::string user(int serial);
constexpr char kEditedScope[] = "read, 'edited'";
constexpr char kFarExpiry[] = "4000000000";
constexpr char kPastExpiry[] = "1600000000";
}  // namespace texts

/// The rows of one table by their serials, without the column "id".
using Table = std::map<int, support::Row>;

struct State {
  Table clients;
  Table codes;
  Table tokens;
  Table log;  // only "msg"

  bool operator==(const State& other) const;
};
void PrintTo(const State& state, std::ostream* out);

/// The states that the file passes through while `operation` runs on `before`:
/// one for each of its transactions, the last being that of its success.
std::vector<State> statesAfter(const State& before, const Operation& operation);

/// Some operation that succeeds on `state`. `serial` is that of the next new row.
Operation drawOperation(const State& state, int& serial, std::mt19937& random);

/// More rows than this make the log rotate: all of them share one second, so
/// that every one goes.
constexpr int kLogMax = 12;

}  // namespace load

#endif  // KELDOAUTH_TESTS_LOAD_CRASH_MODEL_H
