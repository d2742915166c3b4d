// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_LOSS_H
#define TSLAUTHCTL_LOSS_H

#include "analysis/NSSMeaning.h"
#include "analysis/PAMMeaning.h"

#include <ProviderModules.h>

#include <string>
#include <string_view>
#include <vector>

/// What an edit takes away beyond what it is meant to do: the meaning before is compared with the
/// meaning after, the intended edit set aside. Each function gives one sentence for each
/// difference, and none where the two mean the same. No file is opened here.
namespace tessel::tslauthctl {

using authentication::ProviderModules::Edit;

/// What a provider brings into the two system files.
struct ProviderEntries {
    SystemConfiguration::PAMEntry pam;
    SystemConfiguration::NSSService nss;
};

/// The provider's service as the C library reads it from the file.
NSSServices Meaning(SystemConfiguration::NSSService const& service);

/// The provider's entry as libpam reads it from the file.
PAMLine Meaning(SystemConfiguration::PAMEntry const& entry, std::string const& facility);

std::vector<std::string> NSSLosses(std::string_view before, std::string_view after, Edit edit,
                                   SystemConfiguration::NSSService const& service);

/// @param reader gives the policies that the file includes, for the jumps across them
std::vector<std::string> PAMLosses(std::string_view before, std::string_view after, Edit edit,
                                   SystemConfiguration::PAMEntry const& entry,
                                   PAMPolicyReader const& reader);

/// What `text`, the file after an insertion, would lose when the entries are taken out again.
/// A file that the library does not read any more loses everything, which is one sentence.
std::vector<std::string> NSSLossesOnReturn(std::string_view text,
                                           SystemConfiguration::NSSService const& service);
std::vector<std::string> PAMLossesOnReturn(std::string_view text,
                                           SystemConfiguration::PAMEntry const& entry,
                                           PAMPolicyReader const& reader);

/// The class of an exception, with its namespaces.
std::string ClassName(std::exception const& exception);

} // namespace tessel::tslauthctl

#endif
