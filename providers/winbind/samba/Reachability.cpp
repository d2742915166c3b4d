// SPDX-License-Identifier: Apache-2.0
#include "samba/Reachability.h"

#include "Failure.h"
#include "host/Host.h"
#include "samba/BoundedCall.h"

#include <algorithm>
#include <base/Descriptor.h>
#include <cerrno>
#include <chrono>
#include <memory>
#include <netdb.h>
#include <poll.h>
#include <sys/socket.h>

namespace tessel::winbind {

namespace {

/// A domain may have dozens, most of them far away.
constexpr std::size_t mostControllers = 4;
constexpr char ldap[] = "389";

int MillisecondsUntil(Clock::time_point deadline) {
    auto const left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now());
    return static_cast<int>(std::max<std::chrono::milliseconds::rep>(left.count(), 0));
}

typedef std::unique_ptr<addrinfo, void (*)(addrinfo*)> Addresses;

Addresses AddressesOf(std::string const& name) {
    addrinfo hints = {};
    hints.ai_socktype = SOCK_STREAM;
    hints.ai_flags = AI_ADDRCONFIG;
    addrinfo* found = nullptr;
    if (::getaddrinfo(name.c_str(), ldap, &hints, &found) != 0) {
        found = nullptr;
    }
    return {found, [](addrinfo* list) {
                if (list != nullptr) {
                    ::freeaddrinfo(list);
                }
            }};
}

/// A connection that is being made; none where that fails at once.
base::Descriptor BeginConnection(addrinfo const& address) {
    base::Descriptor connection(
        ::socket(address.ai_family, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    if (connection && ::connect(connection.Get(), address.ai_addr, address.ai_addrlen) != 0 &&
        errno != EINPROGRESS) {
        connection.Close();
    }
    return connection;
}

bool IsMade(int connection) {
    int error = 0;
    socklen_t size = sizeof error;
    return ::getsockopt(connection, SOL_SOCKET, SO_ERROR, &error, &size) == 0 && error == 0;
}

/// Whether one of them is made by the deadline.
bool IsOneMade(std::vector<base::Descriptor> const& connections, Clock::time_point deadline) {
    std::vector<pollfd> watched;
    watched.reserve(connections.size());
    for (base::Descriptor const& connection : connections) {
        watched.push_back({connection.Get(), POLLOUT, 0});
    }
    for (std::size_t open = watched.size(); open != 0;) {
        int const count = ::poll(watched.data(), watched.size(), MillisecondsUntil(deadline));
        if (count == 0 || (count < 0 && errno != EINTR)) {
            return false;
        }
        for (pollfd& each : watched) {
            if (count > 0 && each.revents != 0) {
                if (IsMade(each.fd)) {
                    return true;
                }
                each.fd = -1;
                --open;
            }
        }
    }
    return false;
}

bool AnyAnswers(std::vector<std::string> const& controllers, Clock::time_point deadline) {
    std::vector<base::Descriptor> connections;
    for (std::size_t i = 0; i < std::min(controllers.size(), mostControllers); ++i) {
        Addresses const addresses = AddressesOf(controllers[i]);
        for (addrinfo const* each = addresses.get(); each != nullptr; each = each->ai_next) {
            if (base::Descriptor connection = BeginConnection(*each)) {
                connections.push_back(std::move(connection));
            }
        }
    }
    return IsOneMade(connections, deadline);
}

} // namespace

bool IsReachable(Host const& host, std::string const& domain, Clock::time_point deadline) {
    try {
        // The resolver waits longer than anybody who logs in.
        return BoundedCall::Run(
            "the controllers of '" + domain + "'", deadline,
            [&host, domain, deadline] { return AnyAnswers(host.AskDNS(domain), deadline); });
    } catch (Failure const&) {
        return false;
    }
}

} // namespace tessel::winbind
