// SPDX-License-Identifier: Apache-2.0

// The filters switch dynamic adjustment of the thread count on, and a loaded machine then gives one
// thread. Test programs that link this stub get the threads that they ask for.
extern "C" void omp_set_dynamic(int) {}
