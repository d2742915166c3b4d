// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_HOSTNAME_H
#define TSLAUTH_HOSTNAME_H

#include <string>

namespace tessel::authentication {

/// The name that the kernel knows the host by; nothing is resolved. At most 63 bytes: that is how
/// long a label of a domain name may be.
/// @throws InvalidHostNameException "unable to get hostname", also for a longer name
std::string CurrentHostName();

/// `name` up to its first "."; all of it where there is none.
std::string ShortName(std::string const& name);

} // namespace tessel::authentication

#endif
