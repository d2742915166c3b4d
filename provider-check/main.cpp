// SPDX-License-Identifier: Apache-2.0
// tslauth-provider-check: whether a provider keeps to the rules of docs/PROVIDERS.md.
#include "Checks.h"

#include <tslauth/Exceptions.h>
#include <tslauth/Paths.h>

#include <CLI/CLI.hpp>

#include <cstdio>
#include <fstream>
#include <iostream>

namespace {

using namespace tessel;

enum ExitCode { Passes = 0, Findings = 1, Unusable = 2 };

/// A name is what `provider.conf` takes; anything with a "/" is a file.
std::string PathOf(std::string const& provider) {
    return provider.find('/') != std::string::npos
               ? provider
               : authentication::Paths::ProviderPrefix + provider +
                     authentication::Paths::ProviderSuffix;
}

int Run(std::string const& provider, std::string const& profile, std::string const& junit) {
    auto const report =
        providercheck::Check(PathOf(provider), profile.empty() ? providercheck::Profile()
                                                               : providercheck::Profile(profile));
    std::cout << report.Tap() << std::flush;
    if (!junit.empty()) {
        std::ofstream file(junit);
        file << report.JUnit(provider) << std::flush;
        if (!file) {
            std::cerr << "tslauth-provider-check: cannot write '" << junit << "'\n";
            return Unusable;
        }
    }
    return report.Passes() ? Passes : Findings;
}

int Main(int argc, char** argv) {
    CLI::App application("Whether a provider keeps to the rules of its interface",
                         "tslauth-provider-check");
    std::string provider;
    std::string profile;
    std::string junit;
    application.add_option("PROVIDER", provider, "its name, or its file")->required();
    application.add_option("--profile", profile, "what its author says of it");
    application.add_option("--junit", junit, "a file to write the results to, as JUnit's XML");
    try {
        application.parse(argc, argv);
    } catch (CLI::ParseError const& error) {
        return application.exit(error) == 0 ? Passes : Unusable;
    }
    return Run(provider, profile, junit);
}

} // namespace

int main(int argc, char** argv) {
    try {
        return Main(argc, argv);
    } catch (std::exception const& exception) {
        (void)std::fprintf(stderr, "tslauth-provider-check: %s\n", exception.what());
        return Unusable;
    }
}
