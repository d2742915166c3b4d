// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_INSERTEDENTRIES_H
#define TSLAUTHCTL_INSERTEDENTRIES_H

#include <tslauth/ActivationPlan.h>

#include <string>
#include <string_view>
#include <vector>

/// Whose entries the tool has put into the host's files. They can be taken out by this record also
/// when their provider is no longer configured, or gone.
namespace tessel::tslauthctl {

inline constexpr char InsertedRecord[] = "/var/lib/tslauth/inserted";

using EntriesList = std::vector<authentication::ProviderEntries>;

bool IsSame(authentication::ProviderEntries const& left,
            authentication::ProviderEntries const& right);

/// Those of `entries` that are not the same as `other`.
EntriesList Without(EntriesList entries, authentication::ProviderEntries const& other);

/// One line for each: PAM module, its parameters, name service, its parameters, with tabs between
/// them. A line that is not of this form is passed over.
EntriesList ReadInserted(std::string_view text);
std::string PrintInserted(EntriesList const& entries);

/// The record of this host; empty where there is none.
EntriesList InsertedOnHost();

/// @throws Failure where the record cannot be written
void RecordInserted(EntriesList const& entries);

} // namespace tessel::tslauthctl

#endif
