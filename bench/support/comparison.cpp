// SPDX-License-Identifier: Apache-2.0
#include "bench/support/comparison.h"

#include <benchmark/benchmark.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <utility>
#include <vector>

namespace zarn::bench {
namespace {

struct Turn {
  double own;
  double other;
  double copy;
};

struct Case {
  Comparison comparison;
  std::vector<Turn> turns;
};

std::vector<Case>& Registered() {
  static std::vector<Case> cases;
  return cases;
}

// Milliseconds of the second of two runs.
template <typename Run>
double Time(const Run& run) {
  run();
  const auto begin = std::chrono::steady_clock::now();
  run();
  return std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - begin)
      .count();
}

void Measure(Case& c, benchmark::State& state) {
  std::vector<unsigned char> memory(2 * c.comparison.blockBytes, 1);
  const auto copy = [&] {
    std::memcpy(memory.data() + c.comparison.blockBytes, memory.data(), c.comparison.blockBytes);
    benchmark::DoNotOptimize(memory.data());
    benchmark::ClobberMemory();
  };
  for (auto _ : state) {
    const Turn turn{Time(c.comparison.own), Time(c.comparison.other) * c.comparison.otherScale,
                    Time(copy)};
    state.SetIterationTime(turn.own / 1000);
    c.turns.push_back(turn);
  }
}

template <typename Of>
double Median(const std::vector<Turn>& turns, const Of& of) {
  std::vector<double> values;
  for (const Turn& turn : turns) values.push_back(of(turn));
  const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
  std::nth_element(values.begin(), middle, values.end());
  return *middle;
}

}  // namespace

void Compare(Comparison comparison) { Registered().push_back({std::move(comparison), {}}); }

int RunComparisons(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 2;
  for (Case& c : Registered()) {
    benchmark::RegisterBenchmark(c.comparison.name.c_str(),
                                 [&c](benchmark::State& state) { Measure(c, state); })
        ->Unit(benchmark::kMillisecond)
        ->UseManualTime()
        ->MinTime(0.1);
  }
  benchmark::RunSpecifiedBenchmarks();
  std::printf("%-44s %10s %10s %8s %10s  %s\n", "case", "zarn ms", "peer ms", "ratio", "x memcpy",
              "peer");
  for (const auto& [c, turns] : Registered()) {
    if (turns.empty()) continue;
    std::printf("%-44s %10.3f %10.3f %7.2fx %10.1f  %s\n", c.name.c_str(),
                Median(turns, [](const Turn& t) { return t.own; }),
                Median(turns, [](const Turn& t) { return t.other; }),
                Median(turns, [](const Turn& t) { return t.other / t.own; }),
                Median(turns, [](const Turn& t) { return t.own / t.copy; }), c.peer.c_str());
  }
  return 0;
}

}  // namespace zarn::bench
