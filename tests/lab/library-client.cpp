// SPDX-License-Identifier: Apache-2.0
// Calls the library as a host-management service does, and prints what comes of it, one line each.
//
//   library-client [--timeout SECONDS] VERB [ARGUMENT...]
//
// An exception is printed as "<class>: <text>" and gives exit code 1. Passwords come from standard
// input. The verb `watch` keeps one store, and answers the questions that it reads from standard
// input, a line each: "configuration", "trusted" or "state", with the seconds that each took.
#include <tslauth/tslauth.h>

#include <cxxabi.h>

#include <chrono>
#include <cstdlib>
#include <functional>
#include <iostream>
#include <map>
#include <memory>
#include <string>
#include <typeinfo>
#include <vector>

namespace {

using namespace tessel::authentication;
using Arguments = std::vector<std::string>;

std::string ClassOf(std::exception const& exception) {
    int status = 0;
    std::unique_ptr<char, void (*)(void*)> const name(
        abi::__cxa_demangle(typeid(exception).name(), nullptr, nullptr, &status), std::free);
    std::string const full = name ? name.get() : typeid(exception).name();
    return full.substr(full.rfind(':') + 1);
}

std::string PasswordFromInput() {
    std::string password;
    std::getline(std::cin, password);
    return password;
}

void Print(char const* name, std::function<std::string()> const& question) {
    std::string answer;
    try {
        answer = question();
    } catch (std::exception const& exception) {
        answer = ClassOf(exception) + ": " + exception.what();
    }
    std::cout << name << "=" << answer << std::endl;
}

std::string Configuration(ActiveDirectoryStore& store) {
    std::unique_ptr<StoreConfiguration> const any(store.GetStoreConfiguration().release());
    auto const& known = dynamic_cast<ActiveDirectoryStoreConfiguration const&>(*any);
    return known.activeDomain.DNSName() + " " + known.machineAccountDN;
}

std::string Trusted(ActiveDirectoryStore& store) {
    std::string all;
    for (Domain const& domain : store.GetTrustedDomains())
        all += domain.DNSName() + "/" + domain.NetBIOSName() + " ";
    return all;
}

void Ask(ActiveDirectoryStore& store, Arguments const& domains) {
    std::unique_ptr<StoreConfiguration> configuration;
    Print("configuration", [&] {
        configuration.reset(store.GetStoreConfiguration().release());
        return "";
    });
    if (auto const* active =
            dynamic_cast<ActiveDirectoryStoreConfiguration*>(configuration.get())) {
        std::cout << "domain=" << active->activeDomain << "\n"
                  << "dn=" << active->machineAccountDN << "\n";
        for (std::string const& controller : active->preferredDomainControllers)
            std::cout << "preferred=" << controller << "\n";
    }
    Print("trusted", [&] { return Trusted(store); });
    Print("state", [&] { return std::to_string(store.GetDomainTrustState()); });
    for (std::string const& domain : domains) {
        std::cout << "about=" << domain << "\n";
        Print("dc", [&] { return store.GetDomainControllerForDomain(domain); });
        Print("principal", [&] { return store.GetHostPrincipalForDomain(domain); });
        Print("relationship",
              [&] { return std::to_string(store.GetDomainTrustRelationship(domain)); });
    }
}

void Watch(ActiveDirectoryStore& store) {
    std::map<std::string, std::function<std::string()>> const questions = {
        {"configuration", [&] { return Configuration(store); }},
        {"trusted", [&] { return Trusted(store); }},
        {"state", [&] { return std::to_string(store.GetDomainTrustState()); }},
    };
    std::string line;
    while (std::getline(std::cin, line)) {
        auto const begin = std::chrono::steady_clock::now();
        Print(line.c_str(), questions.at(line));
        std::chrono::duration<double> const took = std::chrono::steady_clock::now() - begin;
        std::cout << "seconds=" << took.count() << std::endl;
    }
    std::cout.flush();
    std::_Exit(0); // a question may still be with the provider
}

} // namespace

int main(int count, char** values) try {
    Arguments arguments(values + 1, values + count);
    int timeout = 60;
    if (arguments.size() > 1 && arguments[0] == "--timeout") {
        timeout = std::stoi(arguments[1]);
        arguments.erase(arguments.begin(), arguments.begin() + 2);
    }
    std::string const verb = arguments.at(0);
    arguments.erase(arguments.begin());
    ActiveDirectoryStore store(timeout);
    std::map<std::string, std::function<void()>> const verbs = {
        {"join",
         [&] {
             std::string const password = PasswordFromInput();
             store.JoinDomain(arguments.at(0),
                              Credentials{arguments.at(1).c_str(), password.c_str()},
                              arguments.size() > 2);
         }},
        {"join-cam",
         [&] {
             store.JoinDomainWithCAM(arguments.at(0), arguments.size() > 1 ? arguments[1] : "",
                                     arguments.size() > 2);
         }},
        {"part", [&] { store.PartDomain(); }},
        {"part-as",
         [&] {
             std::string const password = PasswordFromInput();
             store.PartDomain(Credentials{arguments.at(0).c_str(), password.c_str()});
         }},
        {"ask", [&] { Ask(store, arguments); }},
        {"canonical",
         [&] {
             for (std::string const& name : arguments)
                 Print(name.c_str(), [&] { return store.ConvertCanonicalUsername(name); });
         }},
        {"prefer",
         [&] {
             store.SetPreferredDomainControllers({arguments.begin(), arguments.end()});
         }},
        {"watch", [&] { Watch(store); }},
        {"activate", [&] { store.MakeActive(); }},
    };
    verbs.at(verb)();
    return 0;
} catch (std::exception const& exception) {
    std::cout << ClassOf(exception) << ": " << exception.what() << std::endl;
    return 1;
}
