// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMCONFIGURATION_NSSCONFIGURATIONTEXT_H
#define TSLAUTH_SYSTEMCONFIGURATION_NSSCONFIGURATIONTEXT_H

#include <tslauth/systemconfiguration/NSSConfiguration.h>

#include <string>
#include <string_view>

/// The name-service switch file as text in memory, without a stream between, for the same reason as
/// for PAM policies.
namespace SystemConfiguration {

/// As `operator>>`, with the same result and the same exceptions.
void ReadConfiguration(std::string_view text, NSSConfiguration& configuration);

/// Reads one line, given without its line feed. Both readers are a loop over this.
void ReadConfigurationLine(std::string_view line, NSSConfiguration& configuration);

/// Each appends to `out` what `operator<<` writes. Where one throws, `out` holds what came before.
void PrintService(NSSService const& service, std::string& out);
void PrintConfiguration(NSSConfiguration const& configuration, std::string& out);

} // namespace SystemConfiguration

#endif
