// Whole processes side by side: a cold verification, and eight writers at once.

#include <benchmark/benchmark.h>
#include <spawn.h>
#include <sys/ptrace.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <string>
#include <tuple>
#include <vector>

#include "bench/bare_store.h"
#include "bench/world.h"

namespace bench {
namespace {

struct Outcome {
  int failures = 0;
  double seconds = 0;
  double processorSeconds = 0;
};

double secondsOf(const timeval& time) {
  return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_usec) / 1e6;
}

std::string programFolder() {
  return std::filesystem::read_symlink("/proc/self/exe").parent_path().string();
}

/// A program of the build folder and its arguments, as exec takes them.
class Command {
 public:
  Command(const std::string& program, const std::string& verb, const std::string& argument)
      : texts_{programFolder() + "/" + program, verb, argument} {
    for (std::string& text : texts_) arguments_.push_back(text.data());
    arguments_.push_back(nullptr);
  }
  Command(const Command&) = delete;
  Command& operator=(const Command&) = delete;

  void start() const {
    pid_t pid = -1;
    posix_spawn(&pid, arguments_[0], nullptr, nullptr, arguments_.data(), environ);
  }

  [[nodiscard]] pid_t startTraced() const {
    const pid_t pid = fork();
    if (pid != 0) return pid;
    ptrace(PTRACE_TRACEME, 0, nullptr, nullptr);
    execv(arguments_[0], arguments_.data());
    _exit(127);
  }

 private:
  std::vector<std::string> texts_;
  std::vector<char*> arguments_;
};

Outcome run(int processes, const Command& command) {
  Outcome outcome;
  const auto begin = std::chrono::steady_clock::now();
  for (int i = 0; i < processes; ++i) command.start();
  for (int i = 0; i < processes; ++i) {
    int status = 0;
    rusage used{};
    const bool hasEnded = wait4(-1, &status, 0, &used) > 0;
    if (!hasEnded || !WIFEXITED(status) || WEXITSTATUS(status) != 0) ++outcome.failures;
    outcome.processorSeconds += secondsOf(used.ru_utime) + secondsOf(used.ru_stime);
  }
  outcome.seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - begin).count();
  return outcome;
}

/// The "VmHWM" of a process.
double peakKibibytes(pid_t pid) {
  std::ifstream status("/proc/" + std::to_string(pid) + "/status");
  for (std::string word; status >> word;) {
    double peak = 0;
    if (word == "VmHWM:" && status >> peak) return peak;
  }
  return 0;
}

/// The most memory that the command ever has, asked in its last moment: what
/// wait4() tells counts the memory of the process that it was forked from.
double peakKibibytes(const Command& command) {
  const pid_t pid = command.startTraced();
  waitpid(pid, nullptr, 0);
  ptrace(PTRACE_SETOPTIONS, pid, nullptr, PTRACE_O_TRACEEXIT);
  ptrace(PTRACE_CONT, pid, nullptr, nullptr);
  waitpid(pid, nullptr, 0);
  const double peak = peakKibibytes(pid);
  ptrace(PTRACE_CONT, pid, nullptr, nullptr);
  waitpid(pid, nullptr, 0);
  return peak;
}

void measure(benchmark::State& state, int processes, const Command& command) {
  double processorSeconds = 0;
  for (auto _ : state) {
    const Outcome outcome = run(processes, command);
    processorSeconds += outcome.processorSeconds;
    if (outcome.failures > 0) state.SkipWithError("a process failed");
    state.SetIterationTime(outcome.seconds);
  }
  state.counters["cpu_us"] =
      benchmark::Counter(processorSeconds * 1e6, benchmark::Counter::kAvgIterations);
}

void coldVerify(benchmark::State& state, const char* program, const char* verb) {
  install({1000, 0, 0});
  const Command command(program, verb, tokenText(500));
  measure(state, 1, command);
  state.counters["peak_kib"] = peakKibibytes(command);
}

void eightWriters(benchmark::State& state, const char* program, const char* verb) {
  install({});
  measure(state, 8, Command(program, verb, "100"));
}

template <typename Body, typename... Arguments>
benchmark::internal::Benchmark* add(const std::string& name, const char* side, Body body,
                                    Arguments... arguments) {
  return benchmark::RegisterBenchmark((name + "/" + side).c_str(), body, arguments...)
      ->Unit(benchmark::kMicrosecond)
      ->UseManualTime();
}

}  // namespace
}  // namespace bench

int main(int argc, char** argv) {
  constexpr const char* kVerification = "P1 cold verification";
  for (const auto& [side, program, verb] :
       {std::tuple{"library", "process_library", "verify"},
        std::tuple{"static", "process_library_static", "verify"},
        std::tuple{"bare", "process_bare", "verify"},
        std::tuple{"bare, no start-up", "process_bare", "verify-alone"},
        std::tuple{"links only", "process_links", "verify"},
        std::tuple{"nothing", "process_nothing", "verify"}}) {
    bench::add(kVerification, side, bench::coldVerify, program, verb)->Iterations(25);
  }
  for (const auto& [side, program, verb] :
       {std::tuple{"library", "process_library", "issue"},
        std::tuple{"static", "process_library_static", "issue"},
        std::tuple{"bare", "process_bare", "issue"},
        std::tuple{"bare at FULL", "process_bare", "issue-full"}}) {
    bench::add("P2 eight writers of 100 tokens", side, bench::eightWriters, program, verb)
        ->Iterations(1);
  }

  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
  return 0;
}
