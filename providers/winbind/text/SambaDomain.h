// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "text/ProviderOptions.h"
#include "text/SambaSettings.h"

#include <optional>
#include <string>
#include <string_view>
#include <vector>

/// The provider's own file for Samba, which the administrator's includes. Text in, text out: no
/// file is opened here.
namespace tessel::winbind {

/// What the provider's own file says about the domain.
struct SambaDomain {
    std::string realm;       ///< in capitals
    std::string workgroup;   ///< the domain's NetBIOS name
    std::string netbiosName; ///< the host's
    /// Asked before any other domain controller, in this order.
    std::vector<std::string> preferredControllers;
};

/// The provider's own file, for a host whose administrator sets `administrator`. What the provider
/// depends on always stands in it; what is a matter of taste only where the administrator leaves it
/// open; of the options those are so that are. The numbers of users and groups come from ranges
/// that overlap with none of his. Comments may be put in front of the text and nothing behind it:
/// its last line may have to be without a line end.
/// @throws Failure TSLAUTH_PROVIDER_INVALID_PARAMETER for a value with a control character
std::string SambaDomainText(SambaDomain const& domain, SambaSettings const& administrator,
                            ProviderOptions const& options);

/// A whole smb.conf for a tool that must not touch the host: every directory that Samba keeps
/// anything in is below `directory`. It includes nothing.
/// @throws Failure as above
std::string StagedSambaDomainText(SambaDomain const& domain, std::string const& directory);

/// The directories that StagedSambaDomainText() names, `directory` itself not among them. Parents
/// come first. The first is the one that secrets.tdb lies in.
std::vector<std::string> StagingDirectories(std::string const& directory);

/// Reads the provider's own file back. Empty where it lacks the realm or the workgroup.
std::optional<SambaDomain> ReadSambaDomain(std::string_view text);

/// Whether the provider's own file lets users log in while no controller answers.
bool LetsInOffLine(std::string_view text);

/// The provider's own file with other preferred controllers and nothing else changed, so that users
/// keep their numbers whatever the administrator has changed since the join.
/// @throws Failure as above
std::string WithPreferredControllers(std::string_view text,
                                     std::vector<std::string> const& controllers);

} // namespace tessel::winbind
