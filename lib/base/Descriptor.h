// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <unistd.h>

#include <utility>

namespace tessel::base {

/// Owns a file descriptor, or none.
class Descriptor {
public:
    Descriptor() = default;
    /// @param number as open(2) returns it: below zero is none
    explicit Descriptor(int number) noexcept : _number(number) {}
    Descriptor(Descriptor&& other) noexcept : _number(other.Release()) {}
    Descriptor& operator=(Descriptor&& other) noexcept {
        if (this != &other) {
            Close();
            _number = other.Release();
        }
        return *this;
    }
    ~Descriptor() {
        Close();
    }

    int Get() const noexcept {
        return _number;
    }
    explicit operator bool() const noexcept {
        return _number >= 0;
    }

    /// Gives the descriptor up, unclosed.
    int Release() noexcept {
        return std::exchange(_number, -1);
    }

    /// Ignores what close(2) says: who writes syncs before, and a reader has nothing to lose. The
    /// number of an error that is on its way stays.
    void Close() noexcept;

private:
    int _number = -1;
};

} // namespace tessel::base
