// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_SYSTEM_NODE_H
#define TESTS_SYSTEM_NODE_H

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <gtest/gtest.h>
#include <sstream>
#include <string>

/// Keeps a system test, which writes the fixed paths of the system, from the machine's own files.
/// Included by every system test; nothing else is needed. Outside a node the program ends with
/// status 125 before its first test.
namespace node {

/// True if /etc is a mount of its own, from which nothing reaches any other namespace.
inline bool HasPrivateEtc() {
    std::ifstream mounts("/proc/self/mountinfo");
    bool isPrivate = false;
    for (std::string line; std::getline(mounts, line);) {
        // id, parent, device, root, mount point, options, then "shared:N" and the like up to a "-"
        std::istringstream fields(line);
        std::string id, parent, device, root, point, options, tag;
        fields >> id >> parent >> device >> root >> point >> options;
        if (point == "/etc") {
            // The last one lies on top.
            isPrivate = true;
            while (fields >> tag && tag != "-") {
                isPrivate = isPrivate && tag.rfind("shared:", 0) != 0;
            }
        }
    }
    return isPrivate;
}

inline bool IsInside() {
    char const* const mark = std::getenv("TSLAUTH_NODE");
    return mark && std::string(mark) == "1" && HasPrivateEtc();
}

class Guard : public testing::Environment {
public:
    void SetUp() override {
        if (!IsInside()) {
            std::fputs("This test writes to /etc. Run it as: tools/node PROGRAM\n", stderr);
            std::_Exit(125);
        }
    }
};

/// GoogleTest owns it, and calls it before any test.
inline testing::Environment* const guard = testing::AddGlobalTestEnvironment(new Guard);

} // namespace node

#endif
