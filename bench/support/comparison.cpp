// SPDX-License-Identifier: Apache-2.0
#include "bench/support/comparison.h"

#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <map>
#include <memory>
#include <utility>
#include <vector>

namespace zarn::bench {
namespace {

std::vector<Comparison>& Registered() {
  static std::vector<Comparison> cases;
  return cases;
}

// Keeps the median of every benchmark beside the usual console output.
class MedianCollector : public benchmark::ConsoleReporter {
 public:
  MedianCollector() : ConsoleReporter(OO_None) {}

  void ReportRuns(const std::vector<Run>& runs) override {
    for (const Run& run : runs) {
      if (run.aggregate_name == "median") {
        medians_[run.run_name.function_name] = run.GetAdjustedRealTime();
      }
    }
  }

  /// Milliseconds, or 0 for a benchmark that was not selected.
  double Median(const std::string& name) const {
    const auto found = medians_.find(name);
    return found == medians_.end() ? 0.0 : found->second;
  }

 private:
  std::map<std::string, double> medians_;
};

void Register(const std::string& name, std::function<void()> run) {
  benchmark::RegisterBenchmark(name.c_str(),
                               [run = std::move(run)](benchmark::State& state) {
                                 for (auto _ : state) run();
                               })
      ->Unit(benchmark::kMillisecond)
      ->UseRealTime()
      ->MinTime(0.03)
      ->Repetitions(7)
      ->ReportAggregatesOnly();
}

// Allocates when it first runs, so that cases that are not selected cost nothing.
std::function<void()> Copy(std::size_t bytes) {
  auto memory = std::make_shared<std::vector<unsigned char>>();
  return [memory, bytes] {
    if (memory->empty()) memory->resize(2 * bytes);
    std::memcpy(memory->data() + bytes, memory->data(), bytes);
    benchmark::DoNotOptimize(memory->data());
    benchmark::ClobberMemory();
  };
}

}  // namespace

void Compare(Comparison comparison) { Registered().push_back(std::move(comparison)); }

int RunComparisons(int argc, char** argv) {
  std::vector<char*> arguments(argv, argv + argc);
  char interleave[] = "--benchmark_enable_random_interleaving=true";
  arguments.insert(arguments.begin() + 1, interleave);
  int count = static_cast<int>(arguments.size());
  benchmark::Initialize(&count, arguments.data());
  if (benchmark::ReportUnrecognizedArguments(count, arguments.data())) return 2;
  for (const Comparison& c : Registered()) {
    Register(c.name + " | zarn", c.own);
    Register(c.name + " | " + c.peer, c.other);
    Register(c.name + " | memcpy", Copy(c.blockBytes));
  }
  MedianCollector medians;
  benchmark::RunSpecifiedBenchmarks(&medians);
  std::printf("%-44s %10s %10s %8s %10s  %s\n", "case", "zarn ms", "peer ms", "ratio", "x memcpy",
              "peer");
  for (const Comparison& c : Registered()) {
    const double own = medians.Median(c.name + " | zarn");
    const double other = medians.Median(c.name + " | " + c.peer);
    const double copy = medians.Median(c.name + " | memcpy");
    if (own <= 0.0) continue;
    std::printf("%-44s %10.3f %10.3f %7.2fx %10.1f  %s\n", c.name.c_str(), own, other, other / own,
                copy > 0.0 ? own / copy : 0.0, c.peer.c_str());
  }
  return 0;
}

}  // namespace zarn::bench
