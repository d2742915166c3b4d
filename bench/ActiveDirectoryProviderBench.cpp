// SPDX-License-Identifier: Apache-2.0
#include "Cases.h"
#include <tslauth/Paths.h>

#include <tslauth/ActiveDirectoryProvider.h>
#include <tslauth/Exceptions.h>
#include <tslauth/tslauth_provider.h>

#include <dlfcn.h>
#include <stdexcept>

namespace bench {

namespace {

using namespace tessel::authentication;

/// The provider of this folder, as tools/bench installs it.
constexpr char Name[] = "bench";

/// The same function as the library calls, through a pointer that the compiler cannot see through.
void CallPointer(benchmark::State& state) {
    ActiveDirectoryProvider const loaded(Name);
    std::string const path = std::string(Paths::ProviderPrefix) + Name + Paths::ProviderSuffix;
    void* const library = ::dlopen(path.c_str(), RTLD_LAZY);
    auto const* const operations = static_cast<ActiveDirectoryClientOperationsRecord const*>(
        library == nullptr ? nullptr : ::dlsym(library, "ActiveDirectoryClientOperations"));
    if (operations == nullptr) {
        throw std::runtime_error("cannot load the provider");
    }
    auto* entry = operations->partDomain;
    benchmark::DoNotOptimize(entry);
    Measure(state, [&] { benchmark::DoNotOptimize(entry(nullptr)); });
    ::dlclose(library);
}

void CallThatSucceeds(benchmark::State& state) {
    ActiveDirectoryProvider const provider(Name);
    Measure(state, [&] { provider.PartDomain(); });
}

void CallThatFails(benchmark::State& state) {
    ActiveDirectoryProvider const provider(Name);
    std::string const domain = "example.com";
    std::string const unit;
    Credentials const credentials;
    Measure(state, [&] {
        try {
            provider.JoinDomain(domain, unit, credentials);
            throw std::runtime_error("the provider must fail");
        } catch (LogonFailureException const& failure) {
            benchmark::DoNotOptimize(&failure);
        }
    });
}

} // namespace

void AddActiveDirectoryProviderCases(Table& table) {
    table.Add("provider call that succeeds", {Bar::Of::Overhead, 2}, Clock::Processor, 15,
              {{"ours", CallThatSucceeds}, {"pointer", CallPointer}});
    table.Add("provider call that fails, until caught", {Bar::Of::Time, 2000}, Clock::Processor, 15,
              {{"ours", CallThatFails}, {"pointer", CallPointer}});
}

} // namespace bench
