// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_PROVIDERMODULES_H
#define TSLAUTH_PROVIDERMODULES_H

#include <tslauth/systemconfiguration/NSSConfiguration.h>
#include <tslauth/systemconfiguration/PAMPolicy.h>

#include <string>
#include <string_view>

/// What an activation changes, as pure functions: a file's text in, the text to be written out. No
/// file is opened here. The store writes what these return, and `tslauthctl plan` shows it.
namespace tessel::authentication::ProviderModules {

/// `insert` puts the provider's modules into a file, `remove` takes them out again.
enum class Edit { insert, remove };

/// Where a provider's entry stands, and its service.
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

/// `insert`: in "auth" and "account", unless an equal entry stands there, puts `entry` directly
/// after the first pam_access.so entry, or first where there is none.
/// `remove`: erases the first equal entry of "auth" and of "account"; further copies stay.
void Apply(Edit edit, SystemConfiguration::PAMEntry const& entry,
           SystemConfiguration::PAMPolicy& policy);

/// `insert`: puts `service` first in "passwd", "group" and "shadow", unless an equal one is there.
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
