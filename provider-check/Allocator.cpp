// SPDX-License-Identifier: Apache-2.0
// The functions of malloc(3), which the C library leaves to a program that has its own: whatever
// the process loads allocates here. Without locks, so that a process may fork at any time.
#include "Allocator.h"

#include <atomic>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <unistd.h>

extern "C" {
// The C library's own, behind those below.
void* __libc_memalign(std::size_t alignment, std::size_t size);
void __libc_free(void* memory);
}

namespace tessel::providercheck::Allocator {

namespace {

constexpr std::uintptr_t liveMark = 0x5ec0a11a;
constexpr std::uintptr_t releasedMark = 0xdead511a;
constexpr unsigned char released = 0xdd;
constexpr unsigned char border = 0xb0;
constexpr std::size_t borderSize = 16;
/// Enough for each child that a check starts; what is released beyond it is given back.
constexpr std::size_t mostKept = std::size_t{256} << 20;

/// Stands directly before the piece.
struct alignas(16) Header {
    std::uintptr_t mark; // one of the two, with the piece's address in it
    std::size_t size;
    void* base;
    Header* next; // of those that were released
};

std::atomic<Report> report{nullptr};
std::atomic<std::size_t> live{0};
std::atomic<std::size_t> kept{0};
std::atomic<Header*> allReleased{nullptr};

Header* HeaderOf(void const* memory) {
    return static_cast<Header*>(const_cast<void*>(memory)) - 1;
}

std::uintptr_t MarkOf(std::uintptr_t mark, void const* memory) {
    return mark ^ reinterpret_cast<std::uintptr_t>(memory);
}

bool IsAll(unsigned char const* bytes, std::size_t size, unsigned char value) {
    for (std::size_t i = 0; i < size; ++i) {
        if (bytes[i] != value) {
            return false;
        }
    }
    return true;
}

void* Allocate(std::size_t alignment, std::size_t size) {
    std::size_t const front = alignment > sizeof(Header) ? alignment : sizeof(Header);
    if (size > PTRDIFF_MAX - front - borderSize) {
        errno = ENOMEM;
        return nullptr;
    }
    auto const base =
        static_cast<unsigned char*>(__libc_memalign(alignment, front + size + borderSize));
    if (base == nullptr) {
        return nullptr;
    }
    unsigned char* const memory = base + front;
    *HeaderOf(memory) = Header{MarkOf(liveMark, memory), size, base, nullptr};
    std::memset(memory + size, border, borderSize);
    live.fetch_add(1, std::memory_order_relaxed);
    return memory;
}

void Release(void* memory) {
    if (memory == nullptr) {
        return;
    }
    Report const tell = report.load();
    Header* const header = HeaderOf(memory);
    if (header->mark != MarkOf(liveMark, memory)) {
        bool const twice = header->mark == MarkOf(releasedMark, memory);
        if (tell != nullptr) {
            tell(twice ? Fault::ReleasedTwice : Fault::NeverAllocated, memory,
                 twice ? header->size : 0);
        } else if (!twice) {
            __libc_free(memory); // from before this heap was here
        }
        return;
    }
    live.fetch_sub(1, std::memory_order_relaxed);
    auto const bytes = static_cast<unsigned char*>(memory);
    if (tell != nullptr && !IsAll(bytes + header->size, borderSize, border)) {
        tell(Fault::Overrun, memory, header->size);
    }
    header->mark = MarkOf(releasedMark, memory);
    if (tell == nullptr || kept.fetch_add(header->size) > mostKept) {
        header->mark = 0;
        __libc_free(header->base);
        return;
    }
    std::memset(memory, released, header->size);
    header->next = allReleased.load();
    while (!allReleased.compare_exchange_weak(header->next, header)) {
    }
}

} // namespace

bool Watches() {
    return true;
}

void Watch(Report tell) {
    report = tell;
}

void LookAtReleased() {
    Report const tell = report.load();
    for (Header* header = allReleased.load(); header != nullptr; header = header->next) {
        auto const bytes = reinterpret_cast<unsigned char*>(header + 1);
        if (!IsAll(bytes, header->size, released)) {
            tell(Fault::WrittenAfterRelease, bytes, header->size);
        }
    }
}

std::size_t Live() {
    return live.load();
}

std::size_t SizeOf(void const* memory) {
    Header const* const header = HeaderOf(memory);
    return header->mark == MarkOf(liveMark, memory) ? header->size : 0;
}

} // namespace tessel::providercheck::Allocator

using namespace tessel::providercheck;

extern "C" {

__attribute__((visibility("default"))) void* malloc(std::size_t size) {
    return Allocator::Allocate(16, size);
}

__attribute__((visibility("default"))) void free(void* memory) {
    int const error = errno; // which a release leaves alone
    Allocator::Release(memory);
    errno = error;
}

__attribute__((visibility("default"))) void* calloc(std::size_t count, std::size_t size) {
    std::size_t all = 0;
    if (__builtin_mul_overflow(count, size, &all)) {
        errno = ENOMEM;
        return nullptr;
    }
    void* const memory = Allocator::Allocate(16, all);
    return memory == nullptr ? nullptr : std::memset(memory, 0, all);
}

__attribute__((visibility("default"))) void* realloc(void* memory, std::size_t size) {
    if (memory != nullptr && size == 0) {
        free(memory);
        return nullptr;
    }
    void* const larger = Allocator::Allocate(16, size);
    if (larger != nullptr && memory != nullptr) {
        std::size_t const before = Allocator::SizeOf(memory);
        std::memcpy(larger, memory, before < size ? before : size);
        free(memory);
    }
    return larger;
}

__attribute__((visibility("default"))) void* memalign(std::size_t alignment, std::size_t size) {
    return Allocator::Allocate(alignment < 16 ? 16 : alignment, size);
}

__attribute__((visibility("default"))) void* aligned_alloc(std::size_t alignment,
                                                           std::size_t size) {
    return memalign(alignment, size);
}

__attribute__((visibility("default"))) int posix_memalign(void** memory, std::size_t alignment,
                                                          std::size_t size) {
    int const error = errno; // the code is returned instead
    void* const allocated = memalign(alignment, size);
    errno = error;
    if (allocated == nullptr) {
        return ENOMEM;
    }
    *memory = allocated;
    return 0;
}

__attribute__((visibility("default"))) void* valloc(std::size_t size) {
    return memalign(static_cast<std::size_t>(getpagesize()), size);
}

__attribute__((visibility("default"))) void* pvalloc(std::size_t size) {
    auto const page = static_cast<std::size_t>(getpagesize());
    return memalign(page, (size + page - 1) / page * page);
}

__attribute__((visibility("default"))) std::size_t malloc_usable_size(void* memory) {
    return memory == nullptr ? 0 : Allocator::SizeOf(memory);
}
}
