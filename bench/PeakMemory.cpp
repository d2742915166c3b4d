// SPDX-License-Identifier: Apache-2.0
// Preloaded into a benchmark: counts what is allocated at once, at most. It is not part of the
// program, so that the counting does not run while time is measured.
#include "PeakMemory.h"

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <malloc.h>

extern "C" {
void* __libc_malloc(std::size_t size);
void* __libc_calloc(std::size_t count, std::size_t size);
void* __libc_realloc(void* memory, std::size_t size);
void* __libc_memalign(std::size_t alignment, std::size_t size);
void __libc_free(void* memory);
}

namespace {

std::atomic<std::size_t> now{0};
std::atomic<std::size_t> most{0};

void* Added(void* memory) {
    std::size_t const size = malloc_usable_size(memory);
    std::size_t const total = now.fetch_add(size) + size;
    std::size_t known = most.load();
    while (known < total && !most.compare_exchange_weak(known, total)) {
    }
    return memory;
}

void Removed(void* memory) {
    now.fetch_sub(malloc_usable_size(memory));
}

/// A whole process reports when it ends.
struct Report {
    ~Report() {
        if (char const* const path = std::getenv("PEAK_MEMORY_FILE")) {
            if (std::FILE* const file = std::fopen(path, "we")) {
                (void)std::fprintf(file, "%zu\n", most.load());
                (void)std::fclose(file);
            }
        }
    }
} const report;

} // namespace

#define EXPORTED extern "C" __attribute__((visibility("default")))

EXPORTED void* malloc(std::size_t size) {
    return Added(__libc_malloc(size));
}

EXPORTED void* calloc(std::size_t count, std::size_t size) {
    return Added(__libc_calloc(count, size));
}

EXPORTED void* realloc(void* memory, std::size_t size) {
    // Old and new are both there while the contents are copied, and counted so.
    std::size_t const old = malloc_usable_size(memory);
    void* const moved = __libc_realloc(memory, size);
    if (moved != nullptr || size == 0) {
        Added(moved);
        now.fetch_sub(old);
    }
    return moved;
}

EXPORTED void* memalign(std::size_t alignment, std::size_t size) {
    return Added(__libc_memalign(alignment, size));
}

EXPORTED void* aligned_alloc(std::size_t alignment, std::size_t size) {
    return Added(__libc_memalign(alignment, size));
}

EXPORTED int posix_memalign(void** result, std::size_t alignment, std::size_t size) {
    void* const memory = Added(__libc_memalign(alignment, size));
    if (memory == nullptr) {
        return ENOMEM;
    }
    *result = memory;
    return 0;
}

EXPORTED void free(void* memory) {
    Removed(memory);
    __libc_free(memory);
}

EXPORTED void PeakMemoryStart() {
    most = now.load();
}

EXPORTED std::size_t PeakMemoryNow() {
    return now;
}

EXPORTED std::size_t PeakMemoryMost() {
    return most;
}
