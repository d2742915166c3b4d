// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <new>
#include <openssl/crypto.h>
#include <string_view>
#include <vector>

namespace tessel::winbind::cam {

/// Memory that is wiped before it is given back, also where a container outgrows it.
template <typename T> struct WipingAllocator {
    using value_type = T;

    WipingAllocator() = default;
    template <typename U> WipingAllocator(WipingAllocator<U> const&) noexcept {}

    T* allocate(std::size_t count) {
        return static_cast<T*>(::operator new(count * sizeof(T)));
    }

    void deallocate(T* memory, std::size_t count) noexcept {
        OPENSSL_cleanse(memory, count * sizeof(T));
        ::operator delete(memory);
    }

    friend bool operator==(WipingAllocator const&, WipingAllocator const&) noexcept {
        return true;
    }
    friend bool operator!=(WipingAllocator const&, WipingAllocator const&) noexcept {
        return false;
    }
};

/// A code or a blob. A vector, because a short std::string keeps its text within itself, where no
/// allocator wipes it.
using SecretText = std::vector<char, WipingAllocator<char>>;

inline std::string_view View(SecretText const& text) {
    return {text.data(), text.size()};
}

} // namespace tessel::winbind::cam
