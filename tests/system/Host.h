// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_SYSTEM_HOST_H
#define TESTS_SYSTEM_HOST_H

#include "Node.h"
#include <tslauth/Paths.h>

#include <tslauth/Exception.h>

#include <boost/core/demangle.hpp>
#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fstream>
#include <iterator>
#include <map>
#include <string>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

/// The node's system files, as the tests of the stores set them up and look at them.
namespace Host {

namespace Paths = tessel::authentication::Paths;

inline std::string Read(std::string const& path) {
    std::ifstream file(path, std::ios::binary);
    EXPECT_TRUE(file.is_open()) << path;
    return std::string(std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>());
}

inline void Write(std::string const& path, std::string const& text) {
    std::ofstream file(path, std::ios::binary | std::ios::trunc);
    file << text;
    file.close();
    ASSERT_TRUE(file.good()) << path;
}

inline struct stat Status(std::string const& path) {
    struct stat status = {};
    EXPECT_EQ(0, stat(path.c_str(), &status)) << path;
    return status;
}

/// The three files that an activation writes.
inline std::vector<std::string> Files() {
    return {Paths::PAMPolicy, Paths::NSSConfiguration, Paths::AuthenticationConfiguration};
}

/// What stands in those files now, to be compared later.
inline std::map<std::string, std::string> Snapshot() {
    std::map<std::string, std::string> texts;
    for (auto const& path : Files()) {
        texts[path] = access(path.c_str(), F_OK) == 0 ? Read(path) : "(missing)";
    }
    return texts;
}

constexpr char Policy[] = "#%PAM-1.0\n"
                          "# who may log in\n"
                          "auth\trequired\tpam_env.so\n"
                          "auth required /lib/security/$ISA/pam_access.so\n"
                          "auth  [success=ok default=bad]  pam_unix.so  nullok try_first_pass\n"
                          "\n"
                          "account required pam_unix.so\n"
                          "session required pam_unix.so\n"
                          "password required pam_unix.so\n";

constexpr char Switch[] = "# name-service switch\n"
                          "hosts: files dns\n"
                          "passwd:  files\n"
                          "group:   files\n"
                          "shadow:  files\n";

/// A failure for one comparison: its class without namespaces, ": " and its text.
template <typename Call> std::string FailureOf(Call call) {
    try {
        call();
    } catch (std::exception const& failure) {
        std::string const name = boost::core::demangle(typeid(failure).name());
        std::string::size_type const colon = name.rfind(':');
        return (colon == std::string::npos ? name : name.substr(colon + 1)) + ": " + failure.what();
    }
    return "(none)";
}

/// Sets up a host whose active store is "None" and whose provider is `Provider`.
class Test : public testing::Test {
protected:
    static constexpr char const* Provider = "plain";

    void SetUp() override {
        Write(Paths::PAMPolicy, Policy);
        Write(Paths::NSSConfiguration, Switch);
        Write(Paths::AuthenticationConfiguration, "remote-authentication-store = \"None\"\n");
        Write(Paths::ProviderConfiguration, std::string("provider = \"") + Provider + "\"\n");
    }

    void TearDown() override {
        for (auto mounted = _mounted.rbegin(); mounted != _mounted.rend(); ++mounted) {
            EXPECT_EQ(0, umount2(mounted->c_str(), MNT_DETACH)) << *mounted;
        }
    }

    /// Mounts something over `path` for the rest of the test.
    void Mount(char const* source, std::string const& path, char const* type, unsigned long flags,
               char const* data) {
        ASSERT_EQ(0, mount(source, path.c_str(), type, flags, data)) << path << strerror(errno);
        _mounted.push_back(path);
    }

private:
    std::vector<std::string> _mounted;
};

} // namespace Host

#endif
