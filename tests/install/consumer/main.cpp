// SPDX-License-Identifier: Apache-2.0
// What a caller of the installed library does: makes stores by name, reads and prints a policy, and
// catches the library's exceptions as their own classes and as their base.
#include <strandctl/HostCtlException.h>
#include <tslauth/tslauth.h>

#include <iostream>
#include <sstream>

namespace {

int failures = 0;

void Expect(bool condition, char const* what) {
    if (!condition) {
        std::cerr << "not so: " << what << '\n';
        ++failures;
    }
}

} // namespace

int main() {
    using namespace tessel::authentication;

    AuthenticationStoreFactory factory;
    Expect(AuthenticationStoreFactory::Instance() == &factory, "the library knows the one factory");
    Expect(factory.GetRegisteredStores().size() == 2, "two stores are registered");
    auto const store = factory.CreateInstance("None");
    Expect(store.get() != nullptr && store->GetDisplayName() == "None", "the store says its name");
    Expect(dynamic_cast<RemoteAuthenticationStore*>(store.get()) != nullptr,
           "the store's type is known on both sides");

    bool caught = false;
    try {
        Configuration const missing("/nonexistent/file");
    } catch (IOError const& error) {
        caught = std::string(error.what()).find("/nonexistent/file") != std::string::npos;
    }
    Expect(caught, "an exception arrives as its class");

    caught = false;
    try {
        Configuration const missing("/nonexistent/file");
    } catch (Exception const& error) {
        caught = error.Code() == 0;
    }
    Expect(caught, "an exception arrives as its base");

    caught = false;
    try {
        throw HostCtl::Lib::HostCtlException("what a join passes on");
    } catch (HostCtl::Lib::HostCtlException const&) {
        caught = true;
    }
    Expect(caught, "host control's exception can be caught by who links this library alone");

    std::istringstream input("auth required /lib/security/$ISA/pam_unix.so\n");
    SystemConfiguration::PAMPolicy policy("system-auth-generic");
    input >> policy;
    Expect(policy[SystemConfiguration::PAMFacility("auth")].size() == 1, "a policy is read");
    std::ostringstream output;
    output << policy;
    Expect(output.str().find("pam_unix.so") != std::string::npos, "a policy is printed");

    caught = false;
    try {
        SystemConfiguration::PAMFacility const facility("nonsense");
    } catch (SystemConfiguration::InvalidFacilityException const&) {
        caught = true;
    }
    Expect(caught, "a model's exception arrives as its class");
    return failures == 0 ? 0 : 1;
}
