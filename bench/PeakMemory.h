// SPDX-License-Identifier: Apache-2.0
#ifndef BENCH_PEAKMEMORY_H
#define BENCH_PEAKMEMORY_H

#include <cstddef>

/// What the preloaded library offers; null where it is not there. All numbers are bytes of heap.
extern "C" {
/// Forgets what was most before.
__attribute__((weak)) void PeakMemoryStart();
__attribute__((weak)) std::size_t PeakMemoryNow();
__attribute__((weak)) std::size_t PeakMemoryMost();
}

#endif
