// SPDX-License-Identifier: Apache-2.0
#include "Connection.h"

#include "../winbind/Failure.h"
#include "Codes.h"

#include <algorithm>
#include <arpa/inet.h>
#include <cerrno>
#include <cstring>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

namespace tessel::winbind::cam {

namespace {

Codes::Code CodeOf(int error) {
    switch (error) {
    case ECONNREFUSED:
        return Codes::ConnectionRefused;
    case ETIMEDOUT:
        return Codes::TimedOut;
    case ENOMEM:
    case ENOBUFS:
        return Codes::NotEnoughMemory;
    default:
        return Codes::ConnectionInvalid;
    }
}

/// Milliseconds for poll, which waits for as long as it is told with a negative number.
int Remaining(Deadline deadline) {
    using std::chrono::milliseconds;
    auto const left = std::chrono::ceil<milliseconds>(deadline - Deadline::clock::now());
    return static_cast<int>(std::clamp(left, milliseconds(0), milliseconds(3600000)).count());
}

} // namespace

Connection::Connection(std::string const& address, std::uint16_t port, Deadline deadline)
    : _name(address + ":" + std::to_string(port)), _deadline(deadline),
      _socket(socket(AF_INET, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0)) {
    if (_socket < 0) {
        Fail("cannot make a socket for", errno);
    }
    try {
        Connect(address, port);
    } catch (...) {
        (void)close(_socket); // nothing was sent
        throw;
    }
}

Connection::~Connection() {
    (void)close(_socket); // whether all arrived, the answer has told
}

void Connection::Connect(std::string const& address, std::uint16_t port) {
    sockaddr_in target = {};
    target.sin_family = AF_INET;
    target.sin_port = htons(port);
    if (inet_pton(AF_INET, address.c_str(), &target.sin_addr) != 1) {
        Fail("cannot connect to", EADDRNOTAVAIL);
    }
    if (connect(_socket, reinterpret_cast<sockaddr const*>(&target), sizeof target) == 0) {
        return;
    }
    int error = errno;
    // An interrupted attempt goes on as well.
    if (error == EINPROGRESS || error == EINTR) {
        Wait(POLLOUT);
        socklen_t size = sizeof error;
        if (getsockopt(_socket, SOL_SOCKET, SO_ERROR, &error, &size) != 0) {
            error = errno;
        }
    }
    if (error != 0) {
        Fail("cannot connect to", error);
    }
}

void Connection::Send(std::string_view data) {
    while (!data.empty()) {
        ssize_t const count = send(_socket, data.data(), data.size(), MSG_NOSIGNAL);
        if (count >= 0) {
            data.remove_prefix(static_cast<std::size_t>(count));
        } else if (errno == EAGAIN || errno == EWOULDBLOCK) {
            Wait(POLLOUT);
        } else if (errno != EINTR) {
            Fail("cannot send to", errno);
        }
    }
}

std::size_t Connection::Receive(char* data, std::size_t size) {
    for (;;) {
        // Before the data and not only where there is none: a server that sends a byte now and then
        // must not keep us beyond the deadline.
        Wait(POLLIN);
        ssize_t const count = recv(_socket, data, size, 0);
        if (count >= 0) {
            return static_cast<std::size_t>(count);
        }
        if (errno != EINTR && errno != EAGAIN && errno != EWOULDBLOCK) {
            Fail("cannot receive from", errno);
        }
    }
}

void Connection::SendAtOnce(std::string_view data) noexcept {
    (void)!send(_socket, data.data(), data.size(), MSG_NOSIGNAL | MSG_DONTWAIT); // a courtesy
}

void Connection::Wait(short events) const {
    pollfd waiting = {_socket, events, 0};
    for (;;) {
        int const left = Remaining(_deadline);
        int const count = left == 0 ? 0 : poll(&waiting, 1, left);
        if (count > 0) {
            return; // an error too: the next call tells which
        }
        if (count == 0 && Deadline::clock::now() >= _deadline) {
            throw Failure(Codes::TimedOut, "no answer from " + _name + " in time");
        }
        if (count < 0 && errno != EINTR) {
            Fail("cannot wait for", errno);
        }
    }
}

void Connection::Fail(char const* operation, int error) const {
    throw Failure(CodeOf(error), std::string(operation) + " " + _name + ": " + strerror(error));
}

} // namespace tessel::winbind::cam
