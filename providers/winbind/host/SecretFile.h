// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <initializer_list>
#include <string_view>

namespace tessel::winbind {

/// A secret for a child process: a file without a name, in memory, that is overwritten before it
/// goes. A child reads it as /proc/self/fd/N; it is on no disk, in no argument and in no
/// environment, and no page of it is swapped out where the system lets memory be locked.
class SecretFile {
public:
    /// @param pieces are written one behind the other, so that nobody needs to join them first
    /// @throws Failure
    explicit SecretFile(std::initializer_list<std::string_view> pieces);
    SecretFile(SecretFile const&) = delete;
    SecretFile& operator=(SecretFile const&) = delete;
    ~SecretFile();

    /// Open for reading and writing, closed by exec; this object's.
    int Descriptor() const noexcept {
        return _descriptor;
    }

private:
    int _descriptor;
    char* _memory = nullptr;
    std::size_t _size = 0;
};

} // namespace tessel::winbind
