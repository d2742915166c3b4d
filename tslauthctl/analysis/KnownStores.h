// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_KNOWNSTORES_H
#define TSLAUTHCTL_KNOWNSTORES_H

#include <tslauth/AuthenticationStoreFactory.h>

#include <string>

/// The stores by their names.
namespace tessel::tslauthctl {

/// The names of the library's own, as the tool has to know them apart.
inline constexpr char NoStore[] = "None";
inline constexpr char ActiveDirectory[] = "Active Directory";

/// The process's one factory, made on the first call.
authentication::AuthenticationStoreFactory& Stores();

bool IsKnownStore(std::string const& name);

/// @throws Failure (usage) with the known names, where `name` is none of them
void RequireStore(std::string const& name);

} // namespace tessel::tslauthctl

#endif
