// Whole processes side by side: a cold verification, and eight writers at once.

#include <benchmark/benchmark.h>
#include <spawn.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <string>
#include <vector>

#include "bench/bare_store.h"
#include "bench/world.h"

namespace bench {
namespace {

struct Outcome {
  int failures = 0;
  long peakKilobytes = 0;
  double seconds = 0;
};

std::string programFolder() {
  return std::filesystem::read_symlink("/proc/self/exe").parent_path().string();
}

pid_t start(const std::string& program, const std::string& verb, const std::string& argument) {
  const std::string path = programFolder() + "/" + program;
  std::vector<std::string> texts{path, verb, argument};
  std::vector<char*> arguments;
  for (std::string& text : texts) arguments.push_back(text.data());
  arguments.push_back(nullptr);

  pid_t pid = -1;
  return posix_spawn(&pid, path.c_str(), nullptr, nullptr, arguments.data(), environ) == 0 ? pid
                                                                                           : -1;
}

Outcome run(int processes, const std::string& program, const std::string& verb,
            const std::string& argument) {
  Outcome outcome;
  const auto begin = std::chrono::steady_clock::now();
  for (int i = 0; i < processes; ++i) start(program, verb, argument);
  for (int i = 0; i < processes; ++i) {
    int status = 0;
    rusage usage{};
    wait4(-1, &status, 0, &usage);
    if (!WIFEXITED(status) || WEXITSTATUS(status) != 0) ++outcome.failures;
    outcome.peakKilobytes = std::max(outcome.peakKilobytes, usage.ru_maxrss);
  }
  outcome.seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - begin).count();
  return outcome;
}

void measure(benchmark::State& state, int processes, const std::string& program,
             const std::string& verb, const std::string& argument) {
  long peak = 0;
  for (auto _ : state) {
    const Outcome outcome = run(processes, program, verb, argument);
    if (outcome.failures > 0) state.SkipWithError("a process failed");
    state.SetIterationTime(outcome.seconds);
    peak = std::max(peak, outcome.peakKilobytes);
  }
  state.counters["peak_kib"] = static_cast<double>(peak);
}

void coldVerify(benchmark::State& state, const char* program) {
  install({1000, 0, 0});
  measure(state, 1, program, "verify", serialText(500));
}

void eightWriters(benchmark::State& state, const char* program) {
  install({});
  measure(state, 8, program, "issue", "100");
}

void add(const char* name, void (*body)(benchmark::State&, const char*), const char* program,
         int iterations) {
  benchmark::RegisterBenchmark(name, body, program)
      ->Unit(benchmark::kMicrosecond)
      ->UseManualTime()
      ->Iterations(iterations);
}

}  // namespace
}  // namespace bench

int main(int argc, char** argv) {
  using bench::add;
  add("B9 cold verification/library", bench::coldVerify, "process_library", 25);
  add("B9 cold verification/bare", bench::coldVerify, "process_bare", 25);
  add("B9 cold verification/links only", bench::coldVerify, "process_links", 25);
  add("B10 eight writers of 100 tokens/library", bench::eightWriters, "process_library", 1);
  add("B10 eight writers of 100 tokens/bare", bench::eightWriters, "process_bare", 1);

  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
  return 0;
}
