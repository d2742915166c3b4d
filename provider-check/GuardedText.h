// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>

namespace tessel::providercheck {

/// A text as an argument that a provider may only read, and only to its end: it stands in read-only
/// pages of its own, directly before one that nobody may touch. When it is destroyed, nobody may
/// touch any of it.
class GuardedText {
public:
    explicit GuardedText(std::string const& text);
    GuardedText(GuardedText const&) = delete;
    GuardedText& operator=(GuardedText const&) = delete;
    ~GuardedText();

    char const* Get() const {
        return _text;
    }

    /// Whether `address` is of one of these texts, there still or not. For a signal handler.
    static bool IsGuarded(void const* address);

private:
    unsigned char* _pages;
    std::size_t _size;
    char const* _text;
};

} // namespace tessel::providercheck
