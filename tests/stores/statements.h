// What SQLite itself is asked to do, seen from behind the library: every
// connection of the process that is opened from the first use on is watched.

#ifndef KELDOAUTH_TESTS_STORES_STATEMENTS_H
#define KELDOAUTH_TESTS_STORES_STATEMENTS_H

#include <functional>
#include <string>
#include <vector>

class Statements {
 public:
  /// Forgets everything, hooks included.
  static void watch();
  static void clear();
  /// The texts of the statements that began to run, in order. One that SQLite
  /// does not accept never begins.
  static std::vector<std::string> texts();

  /// Called with each text before the statement runs.
  static void before(std::function<void(const std::string&)> hook);

  /// SQLite takes back what a COMMIT was to keep, and the COMMIT fails.
  static void refuseCommits(bool refuse);

  // The connection opened last
  /// gives up at the first lock that it meets;
  static void dontWaitForLocks();
  /// how many statements have met one since;
  static int waits();
  /// is not authorised to begin a transaction;
  static void refuseBegins();
  /// takes statements, and texts, of at most so many bytes.
  static void limitStatementsTo(int bytes);
  static void limitTextsTo(int bytes);
};

#endif  // KELDOAUTH_TESTS_STORES_STATEMENTS_H
