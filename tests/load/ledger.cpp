#include "tests/load/ledger.h"

#include <fstream>

namespace load {

Ledger& Ledger::operator+=(const Ledger& other) {
  rows.insert(other.rows.begin(), other.rows.end());
  failures.insert(failures.end(), other.failures.begin(), other.failures.end());
  calls += other.calls;
  failedCalls += other.failedCalls;
  rounds += other.rounds;
  failedRounds += other.failedRounds;
  return *this;
}

void Ledger::save(const std::string& path) const {
  std::ofstream file(path);
  file << calls << ' ' << failedCalls << ' ' << rounds << ' ' << failedRounds << '\n'
       << rows.size() << '\n';
  for (const std::string& row : rows) file << row << '\n';
  for (const std::string& failure : failures) file << failure << '\n';
}

Ledger Ledger::load(const std::string& path) {
  Ledger ledger;
  std::ifstream file(path);
  std::size_t rowsLeft = 0;
  file >> ledger.calls >> ledger.failedCalls >> ledger.rounds >> ledger.failedRounds;
  file >> rowsLeft >> std::ws;
  for (std::string line; std::getline(file, line);) {
    if (rowsLeft > 0) {
      ledger.rows.insert(line);
      --rowsLeft;
    } else {
      ledger.failures.push_back(line);
    }
  }
  return ledger;
}

}  // namespace load
