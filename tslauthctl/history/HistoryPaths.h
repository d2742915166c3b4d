// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_HISTORYPATHS_H
#define TSLAUTHCTL_HISTORYPATHS_H

#include <string>
#include <vector>

/// Every path that a command may write, by command. None of them holds a secret: those of the
/// machine's account and its keytab are no file of this tool's, and are never kept.
namespace tessel::tslauthctl {

std::vector<std::string> PathsOfActivation();
/// Of `setup` and `unsetup`, with what pam-auth-update writes and what is recorded of it.
std::vector<std::string> PathsOfSetup();
std::vector<std::string> PathsOfAccess();
/// Of `join` and `part`: what they write on every host, and what the provider says it does.
std::vector<std::string> PathsOfMembership(std::vector<std::string> const& ofProvider);

} // namespace tessel::tslauthctl

#endif
