// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_SECRET_H
#define TSLAUTHCTL_SECRET_H

#include <cstddef>

namespace tessel::tslauthctl {

/// The one place in the process where a password stands: pages of its own that are neither swapped
/// nor dumped where the system allows that, and are wiped in the end. It does not grow, so that
/// nothing is ever moved and left behind.
class Secret {
public:
    /// The longest password, in bytes. A terminal gives no longer line either.
    static constexpr std::size_t MaxLength = 4094;

    /// An empty text.
    /// @throws std::bad_alloc
    Secret();
    Secret(Secret const&) = delete;
    Secret& operator=(Secret const&) = delete;
    ~Secret();

    /// Text that ends with a zero as long as the object lives.
    char const* Text() const noexcept {
        return _memory;
    }

    /// For whoever fills it: `Capacity` bytes, the last of which is to stay zero.
    char* Memory() noexcept {
        return _memory;
    }

    void Wipe() noexcept;

    /// The longest password with "\r\n" and the zero at its end.
    static constexpr std::size_t Capacity = MaxLength + 3;

private:
    char* _memory;
};

/// Wipes a secret at the end of its last use, whoever else still holds it.
class LastUse {
public:
    explicit LastUse(Secret& secret) : _secret(secret) {}
    LastUse(LastUse const&) = delete;
    LastUse& operator=(LastUse const&) = delete;
    ~LastUse() {
        _secret.Wipe();
    }

private:
    Secret& _secret;
};

} // namespace tessel::tslauthctl

#endif
