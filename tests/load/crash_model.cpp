#include "tests/load/crash_model.h"

#include <algorithm>
#include <iterator>
#include <ostream>
#include <tuple>

namespace load {
namespace {

using support::Row;

/// The platform's cipher in the form that a test can read.
std::string cipher(const std::string& text) {
  return '<' + text + '>';
}

Row clientRow(int serial) {
  return {{"enable", "1"},
          {"client_id", cipher(texts::identifier(serial))},
          {"client_secret", cipher(texts::identifier(serial))},
          {"redirect_uri", "app.example/" + texts::user(serial)},
          {"scope", "read"},
          {"display_name", texts::user(serial)}};
}

Row codeRow(int serial, const char* expiry) {
  return {{"username", texts::user(serial)},
          {"client_id", cipher(texts::identifier(serial))},
          {"scope", "read"},
          {"code", texts::identifier(serial)},
          {"expired_time", expiry},
          {"state", "state"},
          {"ip", "192.0.2.7"}};
}

Row tokenRow(int serial, const char* expiry) {
  Row row = codeRow(serial, expiry);
  row.erase("code");
  row["access_token"] = row["refresh_token"] = texts::identifier(serial);
  row["flow_type"] = "code";
  return row;
}

bool isExpired(const Table::value_type& row) {
  return row.second.at("expired_time") == texts::kPastExpiry;
}

void removeExpired(Table& table) {
  for (auto row = table.begin(); row != table.end();) {
    row = isExpired(*row) ? table.erase(row) : std::next(row);
  }
}

/// The entry, and the rotation where it comes to that.
void appendLogStates(std::vector<State>& states, State state, int serial, const std::string& msg) {
  state.log[serial] = {{"msg", msg}};
  states.push_back(state);
  if (state.log.size() <= kLogMax) return;
  state.log.clear();
  states.push_back(state);
}

State afterChange(State state, const Operation& operation) {
  const int serial = operation.serial;
  switch (operation.action) {
    case Action::kRegisterClient:
      state.clients[serial] = clientRow(serial);
      break;
    case Action::kDisableClient:
      state.clients.at(serial)["enable"] = "0";
      break;
    case Action::kRemoveClient:
      state.clients.erase(serial);
      break;
    case Action::kIssueCode:
      state.codes[serial] = codeRow(serial, texts::kFarExpiry);
      break;
    case Action::kIssueExpiredCode:
      state.codes[serial] = codeRow(serial, texts::kPastExpiry);
      break;
    case Action::kEditCode:
      state.codes.at(serial)["scope"] = texts::kEditedScope;
      break;
    case Action::kRevokeCode:
      state.codes.at(serial)["expired_time"] = std::to_string(kNow);
      break;
    case Action::kRedeemCode:
      state.codes.erase(serial);
      break;
    case Action::kPurgeCodes:
      removeExpired(state.codes);
      break;
    case Action::kIssueTokens:
      state.tokens[serial] = tokenRow(serial, texts::kFarExpiry);
      break;
    case Action::kIssueExpiredTokens:
      state.tokens[serial] = tokenRow(serial, texts::kPastExpiry);
      break;
    case Action::kRevokeTokens:
      state.tokens.erase(serial);
      break;
    case Action::kPurgeTokens:
      removeExpired(state.tokens);
      break;
    case Action::kClearLog:
      state.log.clear();
      break;
    case Action::kWriteLog:
      break;
  }
  return state;
}

// Drawing -----------------------------------------------------------------------

int expiredRows(const Table& table) {
  return static_cast<int>(std::count_if(table.begin(), table.end(), isExpired));
}

/// The table of which an operation needs a row; null when it needs none.
const Table* tableOf(const State& state, Action action) {
  switch (action) {
    case Action::kDisableClient:
    case Action::kRemoveClient:
      return &state.clients;
    case Action::kEditCode:
    case Action::kRevokeCode:
    case Action::kRedeemCode:
      return &state.codes;
    case Action::kRevokeTokens:
      return &state.tokens;
    case Action::kClearLog:
      return &state.log;
    default:
      return nullptr;
  }
}

bool isPossible(const State& state, Action action) {
  // One row would need no transaction.
  if (action == Action::kPurgeCodes) return expiredRows(state.codes) > 1;
  if (action == Action::kPurgeTokens) return expiredRows(state.tokens) > 1;
  const Table* table = tableOf(state, action);
  return table == nullptr || !table->empty();
}

}  // namespace

namespace texts {

std::string identifier(int serial) {
  const std::string number = std::to_string(serial);
  return std::string(64 - number.size(), '0') + number;
}

std::string user(int serial) {
  return "user " + std::to_string(serial);
}

}  // namespace texts

bool State::operator==(const State& other) const {
  return std::tie(clients, codes, tokens, log) ==
         std::tie(other.clients, other.codes, other.tokens, other.log);
}

void PrintTo(const State& state, std::ostream* out) {
  for (const Table* table : {&state.clients, &state.codes, &state.tokens, &state.log}) {
    *out << '\n' << ::testing::PrintToString(*table);
  }
}

std::vector<State> statesAfter(const State& before, const Operation& operation) {
  std::vector<State> states;
  const std::string user = texts::user(operation.serial);
  if (operation.action == Action::kWriteLog) {
    appendLogStates(states, before, operation.serial, "entry of " + user);
    return states;
  }
  states.push_back(afterChange(before, operation));
  if (operation.action == Action::kRegisterClient) {
    appendLogStates(states, states.back(), operation.serial, "Application registed[" + user + "]");
  }
  return states;
}

Operation drawOperation(const State& state, int& serial, std::mt19937& random) {
  constexpr int kActions = static_cast<int>(Action::kClearLog) + 1;
  Action action{};
  do {
    action = static_cast<Action>(random() % kActions);
  } while (!isPossible(state, action));

  const Table* table = tableOf(state, action);
  if (table == nullptr) return {action, serial++};
  const auto nth = static_cast<std::ptrdiff_t>(random() % table->size());
  return {action, std::next(table->begin(), nth)->first};
}

}  // namespace load
