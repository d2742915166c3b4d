// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_SETUPHOST_H
#define TSLAUTHCTL_SETUPHOST_H

#include "setup/SetupPlan.h"

#include <optional>
#include <string>
#include <vector>

/// The host that is set up: what is read of it, and each way in which it is changed.
namespace tessel::tslauthctl {

/// @throws Failure where the provider, the default policy or libpam's modules are not installed, or
///     a file cannot be read
SetupFacts ReadSetupFacts(std::string const& provider);

/// What a join of the configured provider writes, as far as that says so.
/// @throws Failure
std::vector<std::string> PathsOfJoinOnHost();

/// A file's text; nothing where there is none.
/// @throws Failure where it cannot be read
std::optional<std::string> TextOnHost(std::string const& path);

/// Replaces a file, whole, durably, and with the owner, mode and links that it has; makes it where
/// there is none.
/// @throws Failure
void PutOnHost(std::string const& path, std::string const& text);

/// @throws Failure; a file that is not there is no failure
void RemoveFromHost(std::string const& path);

/// The folders above `path` that are not there, the uppermost first.
std::vector<std::string> MissingFolders(std::string const& path);

/// @throws Failure
void MakeFolder(std::string const& path);

/// Leaves a folder that is not empty.
/// @throws Failure where an empty one stays
void RemoveEmptyFolder(std::string const& path);

/// @throws Failure
void MakeLink(std::string const& path, std::string const& target);

/// Runs a program of the system without input, a minute at most, and gives what it writes to where
/// errors go.
/// @throws Failure where it fails or does not end
std::string RunProgram(std::vector<std::string> arguments);

/// Runs pam-auth-update, which asks nothing and writes the policies that Debian's services include.
/// Blocks for as long as it takes, a minute at most.
/// @throws Failure with what it said
void SwitchProfiles(std::vector<std::string> const& on, std::vector<std::string> const& off);

} // namespace tessel::tslauthctl

#endif
