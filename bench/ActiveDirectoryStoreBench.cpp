// SPDX-License-Identifier: Apache-2.0
#include "Cases.h"
#include "Floor.h"
#include "Host.h"

#include <tslauth/ActiveDirectoryStore.h>

#include <cerrno>
#include <dlfcn.h>
#include <filesystem>
#include <stdexcept>
#include <sys/mount.h>
#include <system_error>

namespace bench {

namespace {

/// While it lives, /etc is a folder of `folder`, with the files of an activation and no others.
class PrivateEtc {
public:
    explicit PrivateEtc(std::string const& folder) {
        std::string const etc = folder + "/etc";
        std::filesystem::create_directories(etc + "/pam.d");
        std::filesystem::create_directories(etc + "/tessel/tslauth");
        if (::mount(etc.c_str(), "/etc", nullptr, MS_BIND, nullptr) != 0) {
            throw std::system_error(errno, std::generic_category(), "mount");
        }
    }
    PrivateEtc(PrivateEtc const&) = delete;
    PrivateEtc& operator=(PrivateEtc const&) = delete;
    ~PrivateEtc() {
        ::umount("/etc");
    }
};

void ActivateByHand() {
    static constexpr std::string_view tail =
        "\tsufficient\t/lib/security/$ISA/pam_bench.so\tuse_first_pass debug \n";
    static std::string const account = "account" + std::string(tail);
    static std::string const auth = "auth" + std::string(tail);
    static constexpr std::string_view recorded =
        "remote-authentication-store = \"Active Directory\"\n";
    Floor::Read(Host::Paths::AuthenticationConfiguration);
    Floor::EditPAMPolicy(Host::Paths::PAMPolicy, Host::Paths::PAMPolicy, account, auth);
    Floor::EditNSSConfiguration(Host::Paths::NSSConfiguration, Host::Paths::NSSConfiguration,
                                "bench");
    Floor::Replace(Host::Paths::AuthenticationConfiguration, [](int file) {
        Floor::Checked(static_cast<int>(::write(file, recorded.data(), recorded.size())));
    });
}

template <typename Activate> Body In(std::string const& folder, Activate activate) {
    return [=](benchmark::State& state) {
        Host::ConfigureProvider();
        tessel::authentication::ActiveDirectoryStore store(60);
        PrivateEtc const etc(folder);
        Host::MakeInactive();
        store.MakeActive();
        std::string const policy = tessel::authentication::ReadFile(Host::Paths::PAMPolicy);
        std::string const services =
            tessel::authentication::ReadFile(Host::Paths::NSSConfiguration);
        std::string const recorded =
            tessel::authentication::ReadFile(Host::Paths::AuthenticationConfiguration);
        MeasureEach(state, Host::MakeInactive, [&] { activate(store); });
        ExpectFile(Host::Paths::PAMPolicy, policy);
        ExpectFile(Host::Paths::NSSConfiguration, services);
        ExpectFile(Host::Paths::AuthenticationConfiguration, recorded);
    };
}

constexpr int ManyStores = 10000;

/// Stores that come and go; the row's peak memory is what they leave, if they leave any.
template <typename Make> Body Coming(Make make) {
    return [=](benchmark::State& state) {
        Host::ConfigureProvider();
        Measure(state, [&] {
            for (int i = 0; i < ManyStores; ++i) {
                make();
            }
        });
    };
}

/// What a store cannot be made without: its provider's name, and the provider.
void LoadByHand() {
    Floor::Read(Host::Paths::ProviderConfiguration);
    void* const library = ::dlopen("/usr/libexec/tslauth/libbench.so", RTLD_LAZY);
    if (library == nullptr || ::dlsym(library, "ActiveDirectoryClientMetadata") == nullptr ||
        ::dlsym(library, "ActiveDirectoryClientOperations") == nullptr) {
        throw std::runtime_error("no provider");
    }
    ::dlclose(library);
}

} // namespace

void AddActiveDirectoryStoreCases(Table& table, Places const& places) {
    using Store = tessel::authentication::ActiveDirectoryStore;
    for (auto const& [place, folder] : places) {
        table.Add("MakeActive, " + place, {Bar::Of::Ratio, 1.5},
                  &place == &places.front().first ? Clock::Processor : Clock::Wall, 15,
                  {{"ours", In(folder, [](Store& store) { store.MakeActive(); }), true},
                   {"floor", In(folder, [](Store&) { ActivateByHand(); }), true}});
    }
    table.Add("10,000 stores made and destroyed", {Bar::Of::Ratio, 1.5}, Clock::Processor, 5,
              {{"ours", Coming([] { Store const store(60); })}, {"floor", Coming(LoadByHand)}});
}

} // namespace bench
