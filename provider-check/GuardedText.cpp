// SPDX-License-Identifier: Apache-2.0
#include "GuardedText.h"

#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <sys/mman.h>
#include <unistd.h>

namespace tessel::providercheck {

namespace {

/// One piece of address space for all texts of a process, of which each has its part for good, so
/// that an address tells whether it is one. A child begins a piece of its own where this one ends.
struct Space {
    std::atomic<unsigned char*> begin{nullptr};
    std::atomic<std::size_t> used{0};
};
constexpr std::size_t spaceSize = std::size_t{512} << 20;
Space space;

std::size_t PageSize() {
    return static_cast<std::size_t>(getpagesize());
}

unsigned char* Begin() {
    if (space.begin == nullptr) {
        void* const pages =
            mmap(nullptr, spaceSize, PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
        if (pages == MAP_FAILED) {
            std::abort();
        }
        unsigned char* nobody = nullptr;
        if (!space.begin.compare_exchange_strong(nobody, static_cast<unsigned char*>(pages))) {
            (void)munmap(pages, spaceSize); // another thread was first
        }
    }
    return space.begin;
}

} // namespace

GuardedText::GuardedText(std::string const& text) {
    std::size_t const page = PageSize();
    std::size_t const needed = text.size() + 1;
    _size = (needed + page - 1) / page * page;
    std::size_t const offset = space.used.fetch_add(_size + page);
    if (offset + _size + page > spaceSize) {
        std::abort(); // a check of ours asks for too many
    }
    _pages = Begin() + offset;
    if (mprotect(_pages, _size, PROT_READ | PROT_WRITE) != 0) {
        std::abort();
    }
    unsigned char* const begin = _pages + _size - needed;
    std::memcpy(begin, text.c_str(), needed);
    _text = reinterpret_cast<char const*>(begin);
    if (mprotect(_pages, _size, PROT_READ) != 0) {
        std::abort();
    }
}

GuardedText::~GuardedText() {
    (void)madvise(_pages, _size, MADV_DONTNEED);
    if (mprotect(_pages, _size, PROT_NONE) != 0) {
        std::abort();
    }
}

bool GuardedText::IsGuarded(void const* address) {
    auto const begin = reinterpret_cast<std::uintptr_t>(space.begin.load());
    auto const place = reinterpret_cast<std::uintptr_t>(address);
    return begin != 0 && place >= begin && place - begin < spaceSize;
}

} // namespace tessel::providercheck
