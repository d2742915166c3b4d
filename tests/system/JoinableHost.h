// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_SYSTEM_JOINABLEHOST_H
#define TESTS_SYSTEM_JOINABLEHOST_H

#include "Host.h"
#include "LoadedProvider.h"
#include "providers/Recording.h"

#include <tslauth/ActiveDirectoryStore.h>

#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <syslog.h>
#include <unistd.h>
#include <vector>

namespace Host {

/// What went to the system log: "warning: " or the priority's number, then the text with its end.
inline std::vector<std::string>& SystemLog() {
    static std::vector<std::string> lines;
    return lines;
}

} // namespace Host

/// In place of the C library's, also for the libraries: the log of the machine stays out of it, and
/// a trailing line end can be seen. For one test program each.
__attribute__((visibility("default"), format(printf, 2, 3))) void syslog(int priority,
                                                                         char const* format, ...) {
    char text[1024];
    va_list arguments;
    va_start(arguments, format);
    (void)std::vsnprintf(text, sizeof text, format, arguments); // a test's texts fit
    va_end(arguments);
    Host::SystemLog().push_back(
        (priority == LOG_WARNING ? std::string("warning: ") : std::to_string(priority)) + text);
}

namespace Host {

constexpr char Hosts[] = "/etc/hosts";
constexpr char ResolvConf[] = "/etc/resolv.conf";

/// A host that can be joined to "corp.example": it has a name that resolves, a management interface
/// with an address and the default route, and files of which every byte is known. Its store's
/// provider writes down what reaches it.
class JoinTest : public Test {
protected:
    static constexpr char const* Address = "192.0.2.10";

    void SetUp() override {
        Test::SetUp();
        SystemLog().clear();
        // Names come from the hosts file alone: no test waits for a server that is not there.
        Write(Paths::NSSConfiguration,
              "passwd: files\ngroup: files\nshadow: files\nhosts: files\n");
        Write(ResolvConf, "nameserver 127.0.0.1\n");
        NameHost("node01");
        Resolve("node01.corp.example node01");
        // Not every kernel has each kind.
        Run("ip link add management type dummy 2>/dev/null || "
            "ip link add management type bridge 2>/dev/null || "
            "ip link add management type veth");
        Run("ip address add 192.0.2.10/24 dev management && ip link set management up && "
            "ip route add default via 192.0.2.1");
        Write(Paths::ProviderConfiguration, "provider = \"recording\"\n");
        _library = std::make_unique<LoadedProvider>("recording");
        _store = std::make_unique<tessel::authentication::ActiveDirectoryStore>(60);
    }

    void TearDown() override {
        _store.reset();
        _library.reset();
        Run("ip link delete management");
        Test::TearDown();
    }

    tessel::authentication::ActiveDirectoryStore& Store() const {
        return *_store;
    }

    Recording& Record() const {
        return _library->Find<Recording>("recording");
    }

    /// What the only call of the provider's entry `number` was called with; a null text shows as
    /// "(null)".
    std::vector<std::string> ArgumentsOf(unsigned number) const {
        if (Record().calls[number] != 1) {
            return {"called " + std::to_string(Record().calls[number]) + " times"};
        }
        std::vector<std::string> arguments;
        for (unsigned i = 0; i < Record().argumentCount; ++i) {
            arguments.push_back(Record().isNull[i] != 0 ? "(null)" : Record().arguments[i]);
        }
        return arguments;
    }

    static void Run(std::string const& command) {
        ASSERT_EQ(0, std::system(command.c_str())) << command;
    }

    static void NameHost(std::string const& name) {
        ASSERT_EQ(0, sethostname(name.c_str(), name.size())) << name;
    }

    /// Makes the management address resolve to `names`, the official one first, and the domain to
    /// something.
    static void Resolve(std::string const& names) {
        Write(Hosts, HostsWith(names));
    }

    static std::string HostsWith(std::string const& names) {
        return "127.0.0.1 localhost\n" + std::string(Address) + " " + names +
               "\n192.0.2.2 corp.example # the domain\n";
    }

    /// The names that the hosts file has for the management address.
    static std::string HostsEntry() {
        std::string const text = Read(Hosts);
        std::string const begin = std::string("\n") + Address;
        std::size_t const at = text.find(begin);
        if (at == std::string::npos) {
            return "(none)";
        }
        std::size_t const names = text.find_first_not_of(" \t", at + begin.size());
        return text.substr(names, text.find('\n', names) - names);
    }

    /// The files that the check of the host's name may change.
    static std::string NameFiles() {
        return Read(Hosts) + "----\n" + Read(ResolvConf);
    }

private:
    std::unique_ptr<LoadedProvider> _library;
    std::unique_ptr<tessel::authentication::ActiveDirectoryStore> _store;
};

} // namespace Host

#endif
