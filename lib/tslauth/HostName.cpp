// SPDX-License-Identifier: Apache-2.0
#include "HostName.h"

#include <tslauth/Exceptions.h>

#include <cstddef>
#include <unistd.h>

namespace tessel::authentication {

std::string CurrentHostName() {
    constexpr std::size_t size = 64;
    // A byte more than is offered, so that the text ends whatever the system call does.
    char name[size + 1] = {};
    if (gethostname(name, size) != 0) {
        throw InvalidHostNameException("unable to get hostname");
    }
    return name;
}

std::string ShortName(std::string const& name) {
    return name.substr(0, name.find('.'));
}

} // namespace tessel::authentication
