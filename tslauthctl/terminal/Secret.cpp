// SPDX-License-Identifier: Apache-2.0
#include "terminal/Secret.h"

#include <cstring>
#include <new>
#include <sys/mman.h>

namespace tessel::tslauthctl {

Secret::Secret() : _memory(nullptr) {
    void* const memory =
        mmap(nullptr, Capacity, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    if (memory == MAP_FAILED) {
        throw std::bad_alloc();
    }
    // Both are a second line of defence, and may be refused by a limit or an old kernel.
    (void)mlock(memory, Capacity);
    (void)madvise(memory, Capacity, MADV_DONTDUMP);
    _memory = static_cast<char*>(memory);
}

Secret::~Secret() {
    Wipe();
    // Wiped already; the pages go with the process at the latest.
    (void)munmap(_memory, Capacity);
}

void Secret::Wipe() noexcept {
    explicit_bzero(_memory, Capacity);
}

} // namespace tessel::tslauthctl
