// SPDX-License-Identifier: Apache-2.0
#include "host/ServiceRecords.h"

#include "Failure.h"
#include "host/PreferredControllers.h"

#include <algorithm>
#include <arpa/nameser.h>
#include <base/AsciiText.h>
#include <cerrno>
#include <chrono>
#include <netdb.h>
#include <resolv.h>
#include <tuple>

namespace tessel::winbind::ServiceRecords {

namespace {

using Clock = std::chrono::steady_clock;

/// A resolver of its own: nothing of the host process's is used or changed.
class Resolver {
public:
    explicit Resolver(std::string const& domain) {
        if (::res_ninit(&_state) != 0) {
            throw Failure(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN,
                          "'" + domain + "': the resolver cannot be set up");
        }
        _state.nscount = std::min(_state.nscount, 2);
        // An answer that a datagram cannot hold still names enough of the controllers. A connection
        // would be waited for without an end.
        _state.options |= RES_IGNTC | RES_USE_EDNS0;
    }
    Resolver(Resolver const&) = delete;
    Resolver& operator=(Resolver const&) = delete;
    ~Resolver() {
        ::res_nclose(&_state);
    }

    std::string Services(std::string const& domain) {
        std::string const name = "_ldap._tcp.dc._msdcs." + domain + '.';
        std::vector<unsigned char> answer(NS_MAXMSG);
        int error = 0;
        Clock::time_point silent;
        Clock::time_point end;
        // A lost datagram costs a second. The longer wait is for a server that is not there at all:
        // the kernel needs three seconds to be sure of that.
        for (int const seconds : {1, 3}) {
            _state.retrans = seconds;
            _state.retry = 1;
            // A server that says that it has failed leaves the same errors, only sooner.
            silent = Clock::now() + std::chrono::seconds(seconds);
            errno = 0;
            int const length = ::res_nquery(&_state, name.c_str(), ns_c_in, ns_t_srv, answer.data(),
                                            static_cast<int>(answer.size()));
            error = errno;
            end = Clock::now();
            if (length >= 0) {
                auto const size = std::min(answer.size(), static_cast<std::size_t>(length));
                return {answer.begin(), answer.begin() + static_cast<std::ptrdiff_t>(size)};
            }
            if (_state.res_h_errno != TRY_AGAIN || error != ETIMEDOUT) {
                break;
            }
        }
        if (_state.res_h_errno == TRY_AGAIN && error == ETIMEDOUT && end >= silent) {
            throw Failure(TSLAUTH_PROVIDER_TIMED_OUT, "DNS does not answer for '" + name + "'");
        }
        throw Failure(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN,
                      "DNS has no '" + name + "': " + ::hstrerror(_state.res_h_errno));
    }

private:
    struct __res_state _state = {};
};

struct Service {
    unsigned int priority;
    unsigned int weight;
    std::string name;
};

} // namespace

std::vector<std::string> Read(std::string_view answer) {
    ns_msg message = {};
    auto const* const bytes = reinterpret_cast<unsigned char const*>(answer.data());
    if (::ns_initparse(bytes, static_cast<int>(answer.size()), &message) != 0) {
        throw Failure(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN, "DNS gives a malformed answer");
    }
    std::vector<Service> services;
    for (int i = 0; i < ns_msg_count(message, ns_s_an); ++i) {
        ns_rr record = {};
        if (::ns_parserr(&message, ns_s_an, i, &record) != 0) {
            break; // what came before it is good
        }
        constexpr int fixedPart = 6;
        if (ns_rr_type(record) != ns_t_srv || ns_rr_rdlen(record) <= fixedPart) {
            continue;
        }
        unsigned char const* const data = ns_rr_rdata(record);
        char name[NS_MAXDNAME] = {};
        if (::dn_expand(ns_msg_base(message), ns_msg_end(message), data + fixedPart, name,
                        sizeof name) >= 0 &&
            IsControllerName(name)) {
            services.push_back({ns_get16(data), ns_get16(data + 2), name});
        }
    }
    std::stable_sort(services.begin(), services.end(), [](Service const& a, Service const& b) {
        return std::tie(a.priority, b.weight) < std::tie(b.priority, a.weight);
    });
    std::vector<std::string> names;
    for (Service const& service : services) {
        bool const isKnown = std::any_of(names.begin(), names.end(), [&](std::string const& name) {
            return base::AsciiText::EqualsIgnoringCase(name, service.name);
        });
        if (!isKnown) {
            names.push_back(service.name);
        }
    }
    return names;
}

std::vector<std::string> Ask(std::string const& domain) {
    auto names = Read(Resolver(domain).Services(domain));
    if (names.empty()) {
        throw Failure(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN,
                      "DNS names no controller of '" + domain + "'");
    }
    return names;
}

} // namespace tessel::winbind::ServiceRecords
