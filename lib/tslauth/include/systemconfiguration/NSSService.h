// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMCONFIGURATION_NSSSERVICE_H
#define TSLAUTH_SYSTEMCONFIGURATION_NSSSERVICE_H

#include "../Export.h"

#include <cstddef>
#include <iosfwd>
#include <list>
#include <string>
#include <utility>

namespace SystemConfiguration {

/// A service that answers a lookup database, with the reactions to its results that stand in
/// square brackets behind it.
///
/// A value that moves without allocating; one object is used by one thread at a time.
class TSLAUTH_EXPORT NSSService {
public:
    /// @param module the service's name as it is to stand in the file, such as `files`
    NSSService(std::string module) noexcept : _module(std::move(module)) {}

    /// The same for a name that is part of a longer text.
    NSSService(char const* module, std::size_t length) : _module(module, length) {}

    std::string const& module() const noexcept {
        return _module;
    }

    /// The words between the brackets in file order, to be edited in place; none for a plain
    /// service.
    std::list<std::string>& parameters() noexcept {
        return _parameters;
    }
    std::list<std::string> const& parameters() const noexcept {
        return _parameters;
    }

    /// Equal modules and equal parameters in the same order.
    bool operator==(NSSService const& other) const;
    bool operator!=(NSSService const& other) const {
        return !(*this == other);
    }

private:
    std::string _module;
    std::list<std::string> _parameters;
};

/// Writes the module, and behind it the parameters in brackets where there are any.
TSLAUTH_EXPORT std::ostream& operator<<(std::ostream& out, NSSService const& service);

} // namespace SystemConfiguration

#endif
