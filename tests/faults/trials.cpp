#include "tests/faults/trials.h"

#include <sqlite3.h>
#include <syslog.h>

#include <algorithm>
#include <filesystem>
#include <iterator>
#include <set>
#include <sstream>
#include <vector>

#include "core/oauth_errors.h"
#include "utils/oauth_names.h"

namespace faults {

namespace fs = std::filesystem;
namespace errors = KELDOAUTHSERVER::errors;
namespace names = KELDOAUTHSERVER::names;
using KELDOAUTHSERVER::OAUTHError;
using support::SystemLog;

namespace {

bool hasLine(const std::string& start) {
  const std::vector<std::string> messages = SystemLog::messages();
  return std::any_of(messages.begin(), messages.end(), [&](const std::string& message) {
    return message.compare(0, start.size(), start) == 0;
  });
}

/// SQLite's own formatter had no memory: its callers go on with an empty text,
/// which they do not tell from an empty value.
bool lostText() {
  return hasLine("Can't transfer to SQL format");
}

/// What a look-up for an empty value comes to.
bool isNothing(const std::string& answer) {
  const bool expired = answer.find(errors::kAccessTokenExpired.message) != std::string::npos;
  return answer == "[]\n" || expired;
}

struct Error {
  int code;
  std::string message;

  bool operator==(const OAUTHError& other) const {
    return code == other.code && message == other.message;
  }
};

bool isTableFull(const Error& error) {
  return error == errors::kClientInfoFull || error == errors::kGrantCodeFull ||
         error == errors::kTokenFull;
}

std::vector<std::string> valuesOf(const std::string& rows) {
  std::vector<std::string> values;
  std::istringstream lines(rows);
  for (std::string line; std::getline(lines, line);) {
    std::istringstream row(line);
    for (std::string value; std::getline(row, value, '|');) values.push_back(value);
  }
  return values;
}

/// Equal to `whole` but for values that are empty, in clear or encrypted.
bool isEmptied(const std::string& rows, const std::string& whole) {
  const std::vector<std::string> values = valuesOf(rows);
  const std::vector<std::string> wholeValues = valuesOf(whole);
  const auto fits = [](const std::string& value, const std::string& wholeValue) {
    return value == wholeValue || value.empty() || value == "<>";
  };
  return std::equal(values.begin(), values.end(), wholeValues.begin(), wholeValues.end(), fits);
}

}  // namespace

void Trials::throwEverywhere(Fault& fault) {
  syslog(LOG_DEBUG, "%s", "the recorder has its memory from here on");
  int trials = 0;
  for (const bool lasting : {false, true}) {
    for (int nth = 1; !HasFailure(); ++nth) {
      SCOPED_TRACE((lasting ? "from occasion " : "at occasion ") + std::to_string(nth));
      if (!throwAt(fault, nth, lasting)) break;
      ++trials;
    }
  }
  RecordProperty("trials", trials);
}

bool Trials::throwAt(Fault& fault, int nth, bool lasting) {
  reset();
  const Holdings before = holdings();
  if (!operation_.isConstruction()) store_ = operation_.open();

  fault.arm(nth, lasting);
  const bool threw = !perform();
  fault.disarm();
  EXPECT_FALSE(threw);
  const bool struck = fault.struck();
  if (threw) return struck;

  judge(fault);
  if (lasting) {
    fault.arm(1, true);
  } else {
    expectUsable();
  }
  store_ = nullptr;
  fault.disarm();
  expectNextObjectReady();

  given_.reset();
  reset();
  EXPECT_EQ(holdings(), before);
  return struck;
}

bool Trials::perform() try {
  if (operation_.isConstruction()) {
    store_ = operation_.open();
  } else {
    given_ = operation_.run(*store_);
  }
  return true;
} catch (...) {
  return false;
}

// Judging ---------------------------------------------------------------------

void Trials::judge(const Fault& fault) {
  if (operation_.isConstruction()) given_ = Answer{isReady(*store_), ""};
  const Inspection found = inspect();
  EXPECT_EQ(found.integrity, "ok|\n");
  expectPrivate();
  if (given_->success) {
    judgeSuccess(found.state);
  } else {
    judgeFailure(fault, found.state);
  }
}

void Trials::judgeSuccess(const State& state) {
  if (lostText()) {
    EXPECT_TRUE(place(state) >= operation_.promised || isFinalButForEmptyValues(state));
    EXPECT_TRUE(given_->text == answer_.text || isNothing(given_->text)) << given_->text;
    return;
  }
  EXPECT_EQ(given_->text, answer_.text);
  const bool sawNothing = operation_.purges && store_->GetErrCode() != errors::kNone.code;
  EXPECT_GE(place(state), sawNothing ? 0 : operation_.promised);
}

/// Every step of a start-up stands by itself; of everything else that fails
/// nothing is there. Only a purge goes on past a removal that failed, where that
/// did not make SQLite end its transaction.
void Trials::judgeFailure(const Fault& fault, const State& state) {
  const bool survives = fault.code() == SQLITE_CANTOPEN || fault.code() == SQLITE_NOMEM;
  if (operation_.isConstruction()) {
    EXPECT_GE(place(state), 0);
  } else if (operation_.purges && survives) {
    EXPECT_TRUE(isPartlyPurged(state));
  } else {
    EXPECT_EQ(place(state), 0);
  }
  if (lostText() && operation_.units == 0 && store_->GetErrCode() == errors::kNone.code) return;
  judgeError(fault);
  EXPECT_TRUE(hasLine("Run Command failed!![") || hasLine("Open DB failed!![") ||
              hasLine("Unexpected failure["));
}

void Trials::judgeError(const Fault& fault) {
  const Error error{store_->GetErrCode(), store_->GetErrMsg()};
  if (isTableFull(error)) {
    EXPECT_TRUE(hasLine("Check Row Max failed["));
  } else if (error == errors::kCreateTableFailed) {
    EXPECT_TRUE(hasLine("Create Table failed!!["));
  } else if (error.message == errors::kOpenFailed) {
    EXPECT_TRUE(hasLine("Open DB failed!![" + std::to_string(error.code) + "]"));
    EXPECT_EQ(error.code, fault.code());
  } else if (error.code == SQLITE_ERROR && lostText()) {
    EXPECT_THAT(error.message, ::testing::HasSubstr("syntax error"));
  } else {
    EXPECT_EQ(error.code, fault.code());
    EXPECT_EQ(error.message, sqlite3_errstr(fault.code()));
  }
}

/// After a fault that has passed, the same object does what it failed to do.
void Trials::expectUsable() {
  if (operation_.isConstruction() || (given_->success && !operation_.purges)) return;
  const Answer again = operation_.run(*store_);
  EXPECT_TRUE(again.success);
  EXPECT_EQ(again.text, answer_.text);
  EXPECT_EQ(place(inspect().state), operation_.units);
}

void Trials::expectNextObjectReady() {
  const auto next = operation_.open();
  EXPECT_TRUE(isReady(*next));
  expectNoHotJournal();
}

/// The place of a state among the operation's, whatever the meta table holds.
/// Start-up that cannot read whether the table is there adds its rows again, and
/// goes on without those that it cannot write; nothing reads them.
int Trials::place(const State& state) const {
  const auto withoutMeta = [](State whole) {
    whole.erase(names::kMetaTable);
    return whole;
  };
  const auto same = [&](const State& known) { return withoutMeta(known) == withoutMeta(state); };
  const auto found = std::find_if(states_.rbegin(), states_.rend(), same);
  return static_cast<int>(states_.rend() - found) - 1;
}

bool Trials::isFinalButForEmptyValues(const State& state) const {
  const State& final = states_.back();
  if (state.size() != final.size()) return false;
  return std::all_of(state.begin(), state.end(), [&](const auto& table) {
    const auto whole = final.find(table.first);
    return whole != final.end() && isEmptied(table.second, whole->second);
  });
}

bool Trials::isPartlyPurged(const State& state) const {
  return std::all_of(states_.front().begin(), states_.front().end(), [&](const auto& table) {
    const auto linesOf = [](const std::string& text) {
      std::istringstream lines(text);
      std::set<std::string> all;
      for (std::string line; std::getline(lines, line);) all.insert(line);
      return all;
    };
    const std::set<std::string> before = linesOf(table.second);
    const std::set<std::string> now = linesOf(state.at(table.first));
    const std::set<std::string> after = linesOf(states_.back().at(table.first));
    return std::includes(before.begin(), before.end(), now.begin(), now.end()) &&
           std::includes(now.begin(), now.end(), after.begin(), after.end());
  });
}

Trials::Holdings Trials::holdings() const {
  const long open = std::distance(fs::directory_iterator("/proc/self/fd"), {});
  return {sqlite3_memory_used(), open, blocks()};
}

}  // namespace faults
