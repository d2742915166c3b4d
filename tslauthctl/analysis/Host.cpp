// SPDX-License-Identifier: Apache-2.0
#include "analysis/Host.h"

#include <tslauth/ActiveDirectoryProvider.h>
#include <tslauth/AuthenticationConfiguration.h>
#include <tslauth/Exceptions.h>
#include <tslauth/ProviderConfiguration.h>

#include <Paths.h>
#include <SystemFile.h>

#include <algorithm>
#include <glob.h>
#include <unistd.h>

namespace tessel::tslauthctl {

using namespace authentication;

AuthenticationStoreFactory& Stores() {
    static AuthenticationStoreFactory factory;
    return factory;
}

void RequireStore(std::string const& name) {
    auto const known = Stores().GetRegisteredStores();
    if (std::find(known.begin(), known.end(), name) != known.end()) {
        return;
    }
    std::string message = "Unknown store '" + name + "'. Known are: ";
    for (auto const& store : known) {
        message += (&store == &known.front() ? "'" : ", '") + store + "'";
    }
    throw Failure(ExitCode::usage, message);
}

std::string RecordedStore() {
    AuthenticationConfiguration const configuration;
    return configuration[Paths::RemoteAuthenticationStoreKey];
}

std::string ConfiguredProvider() {
    try {
        ProviderConfiguration const configuration;
        auto const found = configuration.find(Paths::ProviderKey);
        return found == configuration.end() ? std::string() : found->second;
    } catch (Exception const&) {
        // Loading the provider tells why.
        return {};
    }
}

ProviderEntries LoadProvider() {
    // The store's constructor first, for its exceptions.
    (void)Stores().CreateInstance(ActiveDirectory);
    ActiveDirectoryProvider const provider(ConfiguredProvider());
    using namespace ProviderModules;
    return {PAMEntryFor(provider.PAMModule(), provider.PAMModuleParameters()),
            NSSServiceFor(provider.NSSModule(), provider.NSSModuleParameters())};
}

std::vector<std::string> MissingModules(ProviderEntries const& entries) {
    std::vector<std::string> missing;
    auto const isMissing = [](std::string const& path) { return access(path.c_str(), F_OK) != 0; };

    auto const& module = entries.pam.module();
    std::vector<std::string> candidates = {module};
    std::string const isa = "$ISA";
    if (auto const at = module.find(isa); at != std::string::npos) {
        for (auto const* const directory : Paths::PAMModuleDirectories) {
            candidates.push_back(std::string(module).replace(at, isa.size(), directory));
        }
    }
    if (std::all_of(candidates.begin(), candidates.end(), isMissing)) {
        missing.push_back("the PAM module '" + module +
                          "' is not installed; libpam passes over its entries, and no user of the "
                          "provider can log in");
    }

    std::string const name = "libnss_" + entries.nss.module() + ".so.2";
    bool found = false;
    for (auto const* const directory : Paths::LibraryDirectories) {
        glob_t matches = {};
        found = found || glob((directory + name).c_str(), GLOB_NOSORT, nullptr, &matches) == 0;
        globfree(&matches);
    }
    if (!found) {
        missing.push_back("the name-service module '" + name +
                          "' is not installed; the C library passes over the service, and no user "
                          "of the provider is known");
    }
    return missing;
}

std::optional<std::string> ReadPolicy(std::string const& name) {
    for (auto const* const folder : Paths::PAMPolicyFolders) {
        auto const path = !name.empty() && name.front() == '/' ? name : folder + name;
        try {
            return ReadFile(path);
        } catch (IOError const&) {
            // The next folder may have it.
        }
    }
    return std::nullopt;
}

Failure Refused(std::exception const& exception) {
    return {ExitCode::refused, exception.what(), ClassName(exception)};
}

} // namespace tessel::tslauthctl
