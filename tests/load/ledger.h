// What one process knows of its own rows: the changes that the library
// acknowledged, and whatever went wrong.

#ifndef KELDOAUTH_TESTS_LOAD_LEDGER_H
#define KELDOAUTH_TESTS_LOAD_LEDGER_H

#include <set>
#include <string>
#include <vector>

namespace load {

struct Ledger {
  std::set<std::string> rows;         // "oauth_token <access token>", as acknowledged
  std::vector<std::string> failures;  // calls and log lines, in words
  int calls = 0;
  int failedCalls = 0;
  int rounds = 0;
  int failedRounds = 0;

  void add(const std::string& table, const std::string& key) { rows.insert(table + ' ' + key); }
  void remove(const std::string& table, const std::string& key) { rows.erase(table + ' ' + key); }

  /// What all have together. No two have a row in common.
  Ledger& operator+=(const Ledger& other);

  /// From one process to another.
  void save(const std::string& path) const;
  static Ledger load(const std::string& path);
};

}  // namespace load

#endif  // KELDOAUTH_TESTS_LOAD_LEDGER_H
