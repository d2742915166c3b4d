// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_PROVIDERONHOST_H
#define TSLAUTHCTL_PROVIDERONHOST_H

#include <tslauth/ActivationPlan.h>

#include <string>
#include <vector>

/// The configured provider, and whether the host has what it brings.
namespace tessel::tslauthctl {

/// Its name; empty where none is configured.
std::string ProviderName();

/// Whether libpam finds no module of this name, as it stands in a policy: in none of the folders
/// that builds of it put in the place of "$ISA".
bool IsMissingPAMModule(std::string const& module);

/// One sentence for each of the provider's two modules that is in none of the places where libpam
/// and the C library look for it. Both pass over such a module without a word to who logs in.
std::vector<std::string> MissingModules(authentication::ProviderEntries const& entries);

} // namespace tessel::tslauthctl

#endif
