// The calls that the library makes to SQLite, to create the database file and,
// while it waits for a lock, to the clock. What a test does not script goes where it belongs.

#ifndef KELDOAUTH_TESTS_CORE_ENGINE_H
#define KELDOAUTH_TESTS_CORE_ENGINE_H

#include <functional>
#include <string>

class Engine {
 public:
  /// Forgets scripts and counts.
  static void release();

  static int opened();
  static int closed();

  // Called on entry, with the errno of the caller.
  static void onOpen(std::function<void(int error)> hook);
  static void onClose(std::function<void(int error)> hook);
  static void onExec(std::function<void(const std::string& sql)> hook);

  /// sqlite3_close closes and says `code` all the same.
  static void answerClose(int code);
  /// sqlite3_exec runs nothing that begins with `start`: it returns `code` and
  /// no text.
  static void refuseExec(const std::string& start, int code);
};

/// The creation of files by mknod().
class Creation {
 public:
  static void release();

  static int attempts();
  static void before(std::function<void(int nth)> hook);  // counted from 1
  static void after(std::function<void()> hook);          // only when it worked
  /// The next `times` attempts fail with `error`.
  static void refuse(int error, int times);
};

/// Makes waiting take no time: the monotonic clock stands, and nanosleep() moves
/// it on and returns at once.
class Waiting {
 public:
  static void release();

  /// From now on; `hook` is called in place of each nap, with its number from
  /// 1 on.
  static void onNap(std::function<void(int nth)> hook);
  static int naps();
  static long long napped();  // nanoseconds
};

#endif  // KELDOAUTH_TESTS_CORE_ENGINE_H
