// SPDX-License-Identifier: Apache-2.0
#include "Netlink.h"

#include "Files.h"

#include <arpa/inet.h>
#include <array>
#include <base/Descriptor.h>
#include <cerrno>
#include <cstddef>
#include <cstring>
#include <netinet/in.h>
#include <string>
#include <sys/socket.h>
#include <sys/types.h>

namespace StrandCtl {

namespace {

/// A value of the kernel's structures at a place that may not be aligned for it; nothing if it does
/// not fit.
template <typename T> std::optional<T> Load(char const* data, std::size_t size) {
    if (size < sizeof(T)) {
        return std::nullopt;
    }
    T value;
    std::memcpy(&value, data, sizeof value);
    return value;
}

std::size_t Aligned(std::size_t size) {
    return (size + NLMSG_ALIGNTO - 1) & ~static_cast<std::size_t>(NLMSG_ALIGNTO - 1);
}

/// Calls `take` with the type, the data and the size of each attribute.
template <typename Take> void ForEachAttribute(char const* data, std::size_t size, Take take) {
    while (auto const header = Load<rtattr>(data, size)) {
        if (header->rta_len < sizeof *header || header->rta_len > size) {
            return;
        }
        take(header->rta_type, data + sizeof *header, header->rta_len - sizeof *header);
        std::size_t const step = std::min(Aligned(header->rta_len), size);
        data += step;
        size -= step;
    }
}

/// The family's own header of a message, and where its attributes are.
template <typename Header> struct Body {
    Header header;
    char const* attributes;
    std::size_t size;
};

template <typename Header>
std::optional<Body<Header>> ParseBody(nlmsghdr const& message, int wantedType) {
    if (message.nlmsg_type != wantedType || message.nlmsg_len < sizeof message) {
        return std::nullopt;
    }
    char const* const data = reinterpret_cast<char const*>(&message) + sizeof message;
    std::size_t const size = message.nlmsg_len - sizeof message;
    auto const header = Load<Header>(data, size);
    if (!header) {
        return std::nullopt;
    }
    std::size_t const skipped = std::min(Aligned(sizeof *header), size);
    return Body<Header>{*header, data + skipped, size - skipped};
}

/// One dump: asks for all objects of a kind and hands each message to `take`.
/// @return 0, or an error number; EINTR if the kernel's answer was not of one moment
template <typename Family, typename Take> int DumpOnce(std::uint16_t type, Take take) {
    tessel::base::Descriptor const socket(
        ::socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_ROUTE));
    if (!socket) {
        return errno;
    }
    struct {
        nlmsghdr header;
        Family family;
    } request = {};
    request.header.nlmsg_len = sizeof request;
    request.header.nlmsg_type = type;
    request.header.nlmsg_flags = NLM_F_REQUEST | NLM_F_DUMP;
    // The first byte of every family's header is the address family.
    std::memset(&request.family, AF_INET, 1);
    sockaddr_nl kernel = {};
    kernel.nl_family = AF_NETLINK;
    if (::sendto(socket.Get(), &request, sizeof request, 0, reinterpret_cast<sockaddr*>(&kernel),
                 sizeof kernel) < 0) {
        return errno;
    }
    bool interrupted = false;
    // The kernel never makes a part of an answer longer than this.
    alignas(nlmsghdr) std::array<char, 32768> buffer;
    for (;;) {
        sockaddr_nl sender = {};
        socklen_t senderSize = sizeof sender;
        ssize_t const count = ::recvfrom(socket.Get(), buffer.data(), buffer.size(), MSG_TRUNC,
                                         reinterpret_cast<sockaddr*>(&sender), &senderSize);
        if (count < 0) {
            if (errno == EINTR) {
                continue;
            }
            return errno;
        }
        auto const received = static_cast<std::size_t>(count);
        if (received > buffer.size()) {
            return EMSGSIZE;
        }
        if (sender.nl_pid != 0) {
            continue; // any process may send to the socket; only the kernel is asked
        }
        std::size_t place = 0;
        while (received - place >= sizeof(nlmsghdr)) {
            auto const& message = *reinterpret_cast<nlmsghdr const*>(buffer.data() + place);
            if (message.nlmsg_len < sizeof message || message.nlmsg_len > received - place) {
                return EBADMSG;
            }
            interrupted = interrupted || (message.nlmsg_flags & NLM_F_DUMP_INTR) != 0;
            if (message.nlmsg_type == NLMSG_DONE) {
                return interrupted ? EINTR : 0;
            }
            if (message.nlmsg_type == NLMSG_ERROR) {
                auto const error = Load<int>(buffer.data() + place + sizeof message,
                                             message.nlmsg_len - sizeof message);
                return error && *error != 0 ? -*error : EBADMSG;
            }
            take(message);
            place += std::min(Aligned(message.nlmsg_len), received - place);
        }
    }
}

/// All objects of a kind, as they were at one moment.
template <typename Family, typename Object>
std::vector<Object> Dump(std::uint16_t type, std::optional<Object> (*parse)(nlmsghdr const&),
                         char const* failure) {
    static constexpr int attempts = 10; // the network may change while it is read
    int error = 0;
    for (int attempt = 0; attempt < attempts; ++attempt) {
        std::vector<Object> objects;
        error = DumpOnce<Family>(type, [&](nlmsghdr const& message) {
            if (auto object = parse(message)) {
                objects.push_back(*std::move(object));
            }
        });
        if (error == 0) {
            return objects;
        }
        if (error != EINTR) {
            break;
        }
    }
    ThrowSystemError(failure, error);
}

} // namespace

std::optional<DefaultRoute> ParseRoute(nlmsghdr const& message) {
    auto const body = ParseBody<rtmsg>(message, RTM_NEWROUTE);
    if (!body || body->header.rtm_family != AF_INET || body->header.rtm_dst_len != 0 ||
        body->header.rtm_type != RTN_UNICAST ||
        (body->header.rtm_flags & (RTM_F_CLONED | RTNH_F_DEAD)) != 0) {
        return std::nullopt;
    }
    std::uint32_t table = body->header.rtm_table;
    DefaultRoute route = {0, 0};
    ForEachAttribute(body->attributes, body->size,
                     [&](int type, char const* data, std::size_t size) {
                         if (type == RTA_TABLE) {
                             table = Load<std::uint32_t>(data, size).value_or(table);
                         } else if (type == RTA_PRIORITY) {
                             route.metric = Load<std::uint32_t>(data, size).value_or(0);
                         } else if (type == RTA_OIF) {
                             route.interface = Load<int>(data, size).value_or(0);
                         } else if (type == RTA_MULTIPATH) {
                             // The first of several ways.
                             if (auto const way = Load<rtnexthop>(data, size)) {
                                 route.interface = way->rtnh_ifindex;
                             }
                         }
                     });
    if (table != RT_TABLE_MAIN || route.interface == 0) {
        return std::nullopt;
    }
    return route;
}

std::optional<InterfaceAddress> ParseAddressMessage(nlmsghdr const& message) {
    auto const body = ParseBody<ifaddrmsg>(message, RTM_NEWADDR);
    if (!body || body->header.ifa_family != AF_INET) {
        return std::nullopt;
    }
    std::optional<in_addr> own;
    std::optional<in_addr> peer;
    ForEachAttribute(body->attributes, body->size,
                     [&](int type, char const* data, std::size_t size) {
                         if (type == IFA_LOCAL) {
                             own = Load<in_addr>(data, size);
                         } else if (type == IFA_ADDRESS) {
                             peer = Load<in_addr>(data, size);
                         }
                     });
    // Without an address of its own, the one that there is belongs to both ends.
    if (!own) {
        own = peer;
    }
    char text[INET_ADDRSTRLEN];
    if (!own || !::inet_ntop(AF_INET, &*own, text, sizeof text)) {
        return std::nullopt;
    }
    return InterfaceAddress{static_cast<int>(body->header.ifa_index), text, body->header.ifa_scope,
                            (body->header.ifa_flags & IFA_F_SECONDARY) != 0};
}

std::vector<DefaultRoute> ReadDefaultRoutes() {
    return Dump<rtmsg, DefaultRoute>(RTM_GETROUTE, ParseRoute, "Cannot read the network's routes");
}

std::vector<InterfaceAddress> ReadInterfaceAddresses() {
    return Dump<ifaddrmsg, InterfaceAddress>(RTM_GETADDR, ParseAddressMessage,
                                             "Cannot read the network's addresses");
}

} // namespace StrandCtl
