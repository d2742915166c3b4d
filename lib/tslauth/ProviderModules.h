// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_PROVIDERMODULES_H
#define TSLAUTH_PROVIDERMODULES_H

#include <tslauth/systemconfiguration/NSSConfiguration.h>
#include <tslauth/systemconfiguration/PAMPolicy.h>

#include <meaning/Losses.h>

#include <string>
#include <string_view>

/// What an activation changes, as pure functions: a file's text in, the text to be written out. No
/// file is opened here. `ActivationPlan` shows and writes what these return.
namespace tessel::authentication::ProviderModules {

using meaning::Edit;

/// Where a provider's entries stand, in the order in which they are edited.
inline constexpr SystemConfiguration::PAMFacility::Facility EditedFacilities[] = {
    SystemConfiguration::PAMFacility::auth, SystemConfiguration::PAMFacility::account};
inline constexpr SystemConfiguration::NSSDatabase::Database EditedDatabases[] = {
    SystemConfiguration::NSSDatabase::passwd, SystemConfiguration::NSSDatabase::group,
    SystemConfiguration::NSSDatabase::shadow};

/// The entry for the PAM module of a provider: "sufficient", the module in the directory that the
/// policy names, the parameters.
SystemConfiguration::PAMEntry PAMEntryFor(std::string const& module,
                                          std::list<std::string> const& parameters);

/// The service for the name-service module of a provider.
SystemConfiguration::NSSService NSSServiceFor(std::string const& module,
                                              std::list<std::string> const& parameters);

/// The entry as libpam reads it from a file, and the service as the C library does.
meaning::PAMLine Meaning(SystemConfiguration::PAMEntry const& entry, std::string const& facility);
meaning::NSSServices Meaning(SystemConfiguration::NSSService const& service);

/// `insert`: in the edited facilities, unless an equal entry stands there, puts `entry` directly
/// after the first pam_access.so entry, or first where there is none.
/// `remove`: erases the first equal entry of each; further copies stay.
void Apply(Edit edit, SystemConfiguration::PAMEntry const& entry,
           SystemConfiguration::PAMPolicy& policy);

/// `insert`: puts `service` first in the edited databases, unless an equal one is there.
/// `remove`: erases the first equal service of each.
void Apply(Edit edit, SystemConfiguration::NSSService const& service,
           SystemConfiguration::NSSConfiguration& configuration);

/// The text of a PAM policy file after `edit`.
/// @throws SystemConfiguration::InvalidFacilityException, InvalidControlException as the reader
/// does
std::string EditedPAMPolicy(std::string_view text, Edit edit,
                            SystemConfiguration::PAMEntry const& entry);

/// The text of a name-service switch file after `edit`.
/// @throws SystemConfiguration::InvalidDatabaseException, std::out_of_range as the reader does
std::string EditedNSSConfiguration(std::string_view text, Edit edit,
                                   SystemConfiguration::NSSService const& service);

} // namespace tessel::authentication::ProviderModules

#endif
