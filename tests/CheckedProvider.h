// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_CHECKEDPROVIDER_H
#define TESTS_CHECKEDPROVIDER_H

#include "TemporaryFolder.h"

#include <cstdio>
#include <fstream>
#include <set>
#include <sstream>
#include <string>
#include <sys/wait.h>

/// What tslauth-provider-check says of a provider.
struct CheckedProvider {
    /// @param profile the text of one
    CheckedProvider(std::string const& program, std::string const& provider,
                    std::string const& profile) {
        TemporaryFolder const folder;
        std::ofstream(folder / "profile") << profile;
        std::string const command =
            "'" + program + "' '" + provider + "' --profile '" + folder / "profile" + "'";
        FILE* const pipe = ::popen(command.c_str(), "r");
        if (pipe == nullptr) {
            return;
        }
        for (int character = 0; (character = std::fgetc(pipe)) != EOF;) {
            tap += static_cast<char>(character);
        }
        int const status = ::pclose(pipe);
        exitCode = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
        Read();
    }

    int exitCode = -1;
    std::string tap;
    unsigned points = 0;
    std::set<std::string> broken;  ///< names of rules
    std::set<std::string> skipped; ///< likewise

private:
    void Read() {
        std::istringstream lines(tap);
        for (std::string line; std::getline(lines, line);) {
            bool const fails = line.rfind("not ok ", 0) == 0;
            if (!fails && line.rfind("ok ", 0) != 0) {
                continue;
            }
            ++points;
            std::size_t const begin = line.find(" - ") + 3;
            std::string const rule = line.substr(begin, line.find(':', begin) - begin);
            if (fails) {
                broken.insert(rule);
            } else if (line.find(" # SKIP ") != std::string::npos) {
                skipped.insert(rule);
            }
        }
    }
};

#endif
