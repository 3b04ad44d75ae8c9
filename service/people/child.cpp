#include "service/people/child.h"

#include <dirent.h>
#include <fcntl.h>
#include <spawn.h>
#include <sys/types.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <memory>
#include <thread>

namespace keldoauth::service {
namespace {

using std::chrono::milliseconds;
using Clock = std::chrono::steady_clock;

/// How long a killed program may take to be gone.
constexpr milliseconds kLastWords{1000};

/// A web server that ignores SIGCHLD hands this down, and then the kernel throws
/// exit statuses away.
class KeptStatuses {
 public:
  KeptStatuses() {
    struct sigaction plain {};
    plain.sa_handler = SIG_DFL;
    sigaction(SIGCHLD, &plain, &before_);
  }
  ~KeptStatuses() { sigaction(SIGCHLD, &before_, nullptr); }
  KeptStatuses(const KeptStatuses&) = delete;
  KeptStatuses& operator=(const KeptStatuses&) = delete;

 private:
  struct sigaction before_ {};
};

/// The reading end of a pipe that holds a text and has no writer any more.
class FilledPipe {
 public:
  explicit FilledPipe(std::string_view text) {
    std::array<int, 2> ends{};
    if (text.size() > kMaxQuestionBytes || pipe2(ends.data(), O_CLOEXEC) != 0) return;
    const bool isWhole = write(ends[1], text.data(), text.size()) == ssize_t(text.size());
    close(ends[1]);
    if (isWhole) {
      reader_ = ends[0];
    } else {
      close(ends[0]);
    }
  }
  ~FilledPipe() {
    if (reader_ >= 0) close(reader_);
  }
  FilledPipe(const FilledPipe&) = delete;
  FilledPipe& operator=(const FilledPipe&) = delete;

  [[nodiscard]] int reader() const { return reader_; }

 private:
  int reader_ = -1;
};

/// What happens to descriptors and signals between fork and exec.
class Surroundings {
 public:
  explicit Surroundings(int input) {
    posix_spawn_file_actions_init(&files_);
    posix_spawnattr_init(&signals_);
    isMade_ = posix_spawn_file_actions_adddup2(&files_, input, STDIN_FILENO) == 0 &&
              addNull(STDOUT_FILENO) && addNull(STDERR_FILENO) && closeOthers() && addSignals();
  }
  ~Surroundings() {
    posix_spawn_file_actions_destroy(&files_);
    posix_spawnattr_destroy(&signals_);
  }
  Surroundings(const Surroundings&) = delete;
  Surroundings& operator=(const Surroundings&) = delete;

  [[nodiscard]] std::optional<pid_t> start(const std::string& program) const {
    std::string name = program;
    std::array<char*, 2> arguments{name.data(), nullptr};
    std::array<char*, 1> environment{nullptr};
    pid_t child = 0;
    if (!isMade_ || posix_spawn(&child, program.c_str(), &files_, &signals_, arguments.data(),
                                environment.data()) != 0) {
      return std::nullopt;
    }
    return child;
  }

 private:
  bool addNull(int descriptor) {
    return posix_spawn_file_actions_addopen(&files_, descriptor, "/dev/null", O_WRONLY, 0) == 0;
  }

  /// Ours close themselves; those of the web server may not.
  static bool closeOthers() {
    const std::unique_ptr<DIR, int (*)(DIR*)> open(opendir("/proc/self/fd"), closedir);
    if (!open) return false;
    while (const dirent* entry = readdir(open.get())) {
      const int descriptor = static_cast<int>(std::strtol(entry->d_name, nullptr, 10));
      // An action would be refused for those above a limit that was lowered since.
      if (descriptor > STDERR_FILENO) fcntl(descriptor, F_SETFD, FD_CLOEXEC);
    }
    return true;
  }

  bool addSignals() {
    sigset_t all;
    sigset_t none;
    sigfillset(&all);
    sigdelset(&all, SIGKILL);
    sigdelset(&all, SIGSTOP);
    sigemptyset(&none);
    return posix_spawnattr_setsigdefault(&signals_, &all) == 0 &&
           posix_spawnattr_setsigmask(&signals_, &none) == 0 &&
           posix_spawnattr_setflags(&signals_, POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK) == 0;
  }

  posix_spawn_file_actions_t files_{};
  posix_spawnattr_t signals_{};
  bool isMade_ = false;
};

/// Waits in short steps: no way to wait for one child and a clock at once is
/// found on every kernel. False when it still runs then.
bool isOver(pid_t child, milliseconds patience, int& status) {
  const Clock::time_point end = Clock::now() + patience;
  for (;;) {
    const pid_t ended = waitpid(child, &status, WNOHANG);
    if (ended == child) return true;
    if ((ended < 0 && errno != EINTR) || Clock::now() >= end) return false;
    std::this_thread::sleep_for(milliseconds(1));
  }
}

}  // namespace

std::optional<int> exitStatusOf(const std::string& program, std::string_view question,
                                milliseconds patience) {
  const KeptStatuses kept;
  const FilledPipe input(question);
  if (input.reader() < 0) return std::nullopt;
  const std::optional<pid_t> child = Surroundings(input.reader()).start(program);
  if (!child) return std::nullopt;

  int status = 0;
  if (!isOver(*child, patience, status)) {
    kill(*child, SIGKILL);
    isOver(*child, kLastWords, status);
    return std::nullopt;
  }
  if (!WIFEXITED(status)) return std::nullopt;
  return WEXITSTATUS(status);
}

}  // namespace keldoauth::service
