// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_HOST_H
#define TSLAUTHCTL_HOST_H

#include "analysis/Loss.h"
#include "terminal/Console.h"

#include <tslauth/AuthenticationStoreFactory.h>

#include <optional>
#include <string>
#include <vector>

/// What is read from the host; nothing is written here.
namespace tessel::tslauthctl {

/// The store names of the library, as the tool has to know them apart.
inline constexpr char NoStore[] = "None";
inline constexpr char ActiveDirectory[] = "Active Directory";

/// The process's one factory, made on the first call.
authentication::AuthenticationStoreFactory& Stores();

/// @throws Failure (usage) with the known names, where `name` is none of them
void RequireStore(std::string const& name);

/// The name of the recorded store.
/// @throws IOError, ConfigurationError, InvalidKeyException
std::string RecordedStore();

/// The name of the configured provider; empty where none is configured.
std::string ConfiguredProvider();

/// Loads the configured provider, through the same checks as the store, and asks what it brings.
/// @throws what the store's constructor throws
ProviderEntries LoadProvider();

/// One sentence for each of the provider's two modules that is in none of the places where libpam and
/// the C library look for it. Both pass over such a module without a word to who logs in.
std::vector<std::string> MissingModules(ProviderEntries const& entries);

/// The text of a policy by the name that an include gives; nothing where it cannot be read.
std::optional<std::string> ReadPolicy(std::string const& name);

/// The library's refusal, as a failure of the command.
Failure Refused(std::exception const& exception);

} // namespace tessel::tslauthctl

#endif
