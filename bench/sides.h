// How a measurement is registered beside its baselines: under one name, with the
// side behind it, by which bench/report.py puts them together.

#ifndef KELDOAUTH_BENCH_SIDES_H
#define KELDOAUTH_BENCH_SIDES_H

#include <benchmark/benchmark.h>

#include <functional>
#include <initializer_list>
#include <string>

#include "bench/bare_store.h"

namespace bench {

using Body = void (*)(benchmark::State&);
using SyncedBody = void (*)(benchmark::State&, Sync);

/// How often a measurement runs, 0 for as often as it takes, and for how many
/// rows. What writes runs a fixed number of times, so that the tables stay near
/// the size that their names say.
struct Runs {
  int iterations;
  std::initializer_list<int> sizes;
};

inline void add(const std::string& name, const Runs& runs,
                const std::function<void(benchmark::State&)>& body) {
  auto* entry = benchmark::RegisterBenchmark(name.c_str(), body);
  entry->Unit(benchmark::kMicrosecond)->UseRealTime();
  if (runs.iterations > 0) entry->Iterations(runs.iterations);
  for (const int size : runs.sizes) entry->Arg(size);
}

inline void add(const std::string& name, Body library, Body bare, const Runs& runs) {
  add(name + "/library", runs, library);
  add(name + "/bare", runs, bare);
}

inline void add(const std::string& name, Body library, SyncedBody bare, const Runs& runs) {
  add(name + "/library", runs, library);
  add(name + "/bare", runs, [bare](benchmark::State& state) { bare(state, Sync::kExtra); });
  add(name + "/bare at FULL", runs, [bare](benchmark::State& state) { bare(state, Sync::kFull); });
}

inline void require(benchmark::State& state, bool done) {
  if (!done) state.SkipWithError("operation failed");
}

/// Serials of rows made while measuring: above all that a database starts with.
inline long long nextSerial() {
  static long long serial = 1000000;
  return ++serial;
}

}  // namespace bench

#endif  // KELDOAUTH_BENCH_SIDES_H
