// SPDX-License-Identifier: Apache-2.0
#include "analysis/ProviderOnHost.h"

#include <tslauth/Exceptions.h>
#include <tslauth/ProviderConfiguration.h>

#include <algorithm>
#include <glob.h>
#include <iterator>
#include <unistd.h>

namespace tessel::tslauthctl {

using namespace authentication;

namespace {

/// What builds of libpam put in the place of "$ISA".
constexpr char const* PAMModuleDirectories[] = {".", "/lib/security", "../../lib64/security",
                                                "../../lib/security"};
/// Patterns of the folders that hold the C library's modules.
constexpr char const* LibraryDirectories[] = {
    "/lib/*-linux-gnu*/", "/usr/lib/*-linux-gnu*/", "/lib64/", "/usr/lib64/", "/lib/", "/usr/lib/"};

bool IsMissing(std::string const& path) {
    return access(path.c_str(), F_OK) != 0;
}

bool IsIn(std::string const& directories, std::string const& file) {
    glob_t matches = {};
    bool const found = glob((directories + file).c_str(), GLOB_NOSORT, nullptr, &matches) == 0;
    globfree(&matches);
    return found;
}

bool IsMissingNSSModule(std::string const& file) {
    return std::none_of(std::begin(LibraryDirectories), std::end(LibraryDirectories),
                        [&](char const* directories) { return IsIn(directories, file); });
}

} // namespace

std::string ProviderName() {
    try {
        return ConfiguredProvider();
    } catch (Exception const&) {
        // Loading the provider tells why.
        return {};
    }
}

bool IsMissingPAMModule(std::string const& module) {
    std::vector<std::string> candidates = {module};
    std::string const isa = "$ISA";
    if (auto const at = module.find(isa); at != std::string::npos) {
        for (auto const* const directory : PAMModuleDirectories) {
            candidates.push_back(std::string(module).replace(at, isa.size(), directory));
        }
    }
    return std::all_of(candidates.begin(), candidates.end(), IsMissing);
}

std::vector<std::string> MissingModules(ProviderEntries const& entries) {
    std::vector<std::string> missing;
    auto const& module = entries.pam.module();
    if (IsMissingPAMModule(module)) {
        missing.push_back("the PAM module '" + module +
                          "' is not installed; libpam passes over its entries, and no user of the "
                          "provider can log in");
    }
    std::string const name = "libnss_" + entries.nss.module() + ".so.2";
    if (IsMissingNSSModule(name)) {
        missing.push_back("the name-service module '" + name +
                          "' is not installed; the C library passes over the service, and no user "
                          "of the provider is known");
    }
    return missing;
}

} // namespace tessel::tslauthctl
