// A small timing harness: benchmarks register themselves and main runs them (all, or those
// whose name contains the first argument), printing one table row per measurement.
#pragma once

#include <functional>
#include <string>

namespace bench {

struct Registrar {
  Registrar(const char* name, std::function<void()> run);
};

// Median wall time in seconds of runs calls of fn (after one warm-up call).
double medianSeconds(int runs, const std::function<void()>& fn);
// Peak resident memory of the process so far, in MiB.
double peakResidentMiB();
// Prints one row: name, median seconds, and a free-form note.
void report(const std::string& name, double seconds, const std::string& note = "");

}  // namespace bench

#define VIRADUVE_BENCH(fn)                                   \
  static void fn();                                          \
  static const bench::Registrar fn##_registrar(#fn, fn);     \
  static void fn()
