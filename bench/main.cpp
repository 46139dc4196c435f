#include <sys/resource.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <string>
#include <utility>
#include <vector>

#include "bench.h"

namespace bench {

namespace {

std::vector<std::pair<std::string, std::function<void()>>>& registry() {
  static std::vector<std::pair<std::string, std::function<void()>>> r;
  return r;
}

}  // namespace

Registrar::Registrar(const char* name, std::function<void()> run) {
  registry().emplace_back(name, std::move(run));
}

double medianSeconds(int runs, const std::function<void()>& fn) {
  fn();
  std::vector<double> t;
  for (int i = 0; i < runs; ++i) {
    const auto start = std::chrono::steady_clock::now();
    fn();
    t.push_back(std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count());
  }
  std::sort(t.begin(), t.end());
  return t.empty() ? 0.0 : t[t.size() / 2];
}

double peakResidentMiB() {
  rusage usage{};
  getrusage(RUSAGE_SELF, &usage);
  return static_cast<double>(usage.ru_maxrss) / 1024.0;
}

void report(const std::string& name, double seconds, const std::string& note) {
  std::fprintf(stderr, "%-58s %10.4f s  %s\n", name.c_str(), seconds, note.c_str());
}

}  // namespace bench

int main(int argc, char** argv) {
  const std::string filter = argc > 1 ? argv[1] : "";
  // The library logs to standard output; the table goes to standard error.
  std::fprintf(stderr, "%-58s %12s  %s\n", "benchmark", "median", "note");
  for (auto& [name, run] : bench::registry()) {
    if (!filter.empty() && name.find(filter) == std::string::npos) continue;
    run();
  }
  return 0;
}
