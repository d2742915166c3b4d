// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMCONFIGURATION_PAMPOLICYTEXT_H
#define TSLAUTH_SYSTEMCONFIGURATION_PAMPOLICYTEXT_H

#include <tslauth/systemconfiguration/PAMPolicy.h>

#include <string>
#include <string_view>

/// PAM policies as text in memory, without a stream between: an activation reads and prints a whole
/// file, and a stream would cost several times the work itself.
namespace SystemConfiguration {

/// As `operator>>`, with the same result and the same exceptions.
void ReadPolicy(std::string_view text, PAMPolicy& policy);

/// Each appends to `out` what `operator<<` writes. Where one throws, `out` holds what came before.
void PrintEntry(PAMEntry const& entry, std::string& out);
void PrintStack(PAMStack const& stack, std::string& out);
void PrintPolicy(PAMPolicy const& policy, std::string& out);

} // namespace SystemConfiguration

#endif
