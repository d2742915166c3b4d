// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace tessel::winbind::cam {

using Deadline = std::chrono::steady_clock::time_point;

/// A TCP connection of which every wait ends at one deadline. No signal is raised where the other
/// side has gone.
class Connection {
public:
    /// Connects.
    /// @throws Failure ConnectionRefused, TimedOut, or ConnectionInvalid where there is no way to
    ///         the address or it is none
    Connection(std::string const& address, std::uint16_t port, Deadline deadline);
    Connection(Connection const&) = delete;
    Connection& operator=(Connection const&) = delete;
    ~Connection();

    /// Sends all of it.
    /// @throws Failure ConnectionInvalid, TimedOut
    void Send(std::string_view data);

    /// @return how much came, 0 where the other side has ended
    /// @throws Failure ConnectionInvalid, TimedOut
    std::size_t Receive(char* data, std::size_t size);

    /// Sends what can be sent without waiting.
    void SendAtOnce(std::string_view data) noexcept;

private:
    void Connect(std::string const& address, std::uint16_t port);
    void Wait(short events) const;
    [[noreturn]] void Fail(char const* operation, int error) const;

    std::string const _name; // for texts
    Deadline const _deadline;
    int _socket;
};

} // namespace tessel::winbind::cam
