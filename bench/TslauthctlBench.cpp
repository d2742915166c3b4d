// SPDX-License-Identifier: Apache-2.0
#include "Cases.h"
#include "Host.h"

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <spawn.h>
#include <stdexcept>
#include <sys/wait.h>
#include <system_error>
#include <unistd.h>
#include <vector>

#ifndef TSLAUTHCTL
#define TSLAUTHCTL "tslauthctl"
#endif

namespace bench {

namespace {

using Command = std::vector<char const*>;

void Execute(Command const& command) {
    Command arguments = command;
    arguments.push_back(nullptr);
    posix_spawn_file_actions_t actions;
    ::posix_spawn_file_actions_init(&actions);
    ::posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
    pid_t child = 0;
    int const error = ::posix_spawnp(&child, arguments.front(), &actions, nullptr,
                                     const_cast<char* const*>(arguments.data()), environ);
    ::posix_spawn_file_actions_destroy(&actions);
    if (error != 0) {
        throw std::system_error(error, std::generic_category(), arguments.front());
    }
    int status = 0;
    if (::waitpid(child, &status, 0) != child || status != 0) {
        throw std::runtime_error(std::string(arguments.front()) + " failed");
    }
}

template <typename Prepare> Body Running(Prepare prepare, Command const& command) {
    return [=](benchmark::State& state) {
        Host::ConfigureProvider();
        // The whole process's peak, which it tells at its end.
        std::string const report = std::filesystem::temp_directory_path() / "peak";
        ::setenv("PEAK_MEMORY_FILE", report.c_str(), 1);
        MeasureEach(state, prepare, [&] { Execute(command); });
        ::unsetenv("PEAK_MEMORY_FILE");
        if (observation.active && std::filesystem::exists(report)) {
            observation.peak = std::stoul(tessel::authentication::ReadFile(report));
        }
    };
}

} // namespace

void AddTslauthctlCases(Table& table) {
    table.Add(
        "tslauthctl activate, a process", {Bar::Of::Ratio, 0.1}, Clock::Wall, 7,
        {{"ours", Running(Host::MakeInactive, {TSLAUTHCTL, "activate", "Active Directory"}), true},
         {"pam-auth-update", Running([] {}, {"pam-auth-update", "--package", "--force"}), true}});
}

} // namespace bench
