// SPDX-License-Identifier: Apache-2.0
#include <omp.h>

#include <cstdio>

#include "bench/support/comparison.h"

// The filters let the run-time reduce the number of threads on a loaded machine, which would
// falsify a measurement unseen: the benchmarks keep what they ask for.
extern "C" void omp_set_dynamic(int) {}

int main(int argc, char** argv) {
  std::printf("threads available: %d\n", omp_get_max_threads());
  return zarn::bench::RunComparisons(argc, argv);
}
