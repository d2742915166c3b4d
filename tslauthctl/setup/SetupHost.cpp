// SPDX-License-Identifier: Apache-2.0
#include "setup/SetupHost.h"

#include "analysis/ProviderOnHost.h"
#include "setup/SetupPaths.h"
#include "terminal/Console.h"

#include <base/Descriptor.h>
#include <base/FileError.h>
#include <base/KeyValueText.h>
#include <base/WholeFile.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <fcntl.h>
#include <iterator>
#include <poll.h>
#include <spawn.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

namespace tessel::tslauthctl {

namespace {

[[noreturn]] void Fail(std::string const& operation, std::string const& path, int error) {
    throw Failure(ExitCode::failure, base::FileError(operation, path, error).what());
}

bool Exists(std::string const& path) {
    return access(path.c_str(), F_OK) == 0;
}

void RequireProvider(std::string const& name) {
    if (name.empty() || name.find('/') != std::string::npos) {
        throw Failure(ExitCode::usage, "'" + name + "' is no name of a provider");
    }
    auto const library = Paths::ProviderPrefix + name + Paths::ProviderSuffix;
    if (!Exists(library)) {
        throw Failure(ExitCode::refused, "The provider '" + name +
                                             "' is not installed: there is no '" + library + "'");
    }
}

ProviderSetup ReadProvidersFile(std::string const& provider) {
    auto const path = Paths::ProviderSetupPrefix + provider + Paths::ProviderSetupSuffix;
    try {
        return ReadProviderSetup(TextOnHost(path).value_or(std::string()));
    } catch (base::KeyValueError const& e) {
        throw Failure(ExitCode::failure, "'" + path + "': " + e.what());
    }
}

std::string ReadDefaultPolicy() {
    auto text = TextOnHost(Paths::DefaultPolicy);
    if (!text) {
        throw Failure(ExitCode::refused, std::string("'") + Paths::DefaultPolicy +
                                             "' is missing, with which a policy begins");
    }
    return std::move(*text);
}

/// The links that lead nowhere. Debian's libpam, which has its modules in a folder of the
/// architecture, looks in one place alone.
/// @throws Failure where there is no module to lead to
std::vector<std::string> MissingLinks(std::string const& folder) {
    auto const isThere = [](std::string const& in) {
        return Exists(in + "/" + Paths::PAMAccessModule);
    };
    std::vector<std::string> missing;
    if (isThere(folder)) {
        std::remove_copy_if(std::begin(Paths::ModuleLinks), std::end(Paths::ModuleLinks),
                            std::back_inserter(missing), isThere);
    } else if (IsMissingPAMModule(std::string(Paths::PAMModulePrefix) + Paths::PAMAccessModule)) {
        throw Failure(ExitCode::refused, "There is no '" + folder + "/" + Paths::PAMAccessModule +
                                             "', which decides who may log in");
    }
    return missing;
}

/// Owns a process that was started.
class Child {
public:
    explicit Child(pid_t process) : _process(process) {}
    Child(Child const&) = delete;
    Child& operator=(Child const&) = delete;
    ~Child() {
        if (_process > 0) {
            (void)kill(_process, SIGKILL); // it is waited for all the same
            (void)Wait();
        }
    }

    /// How it ended, as waitpid(2) has it.
    int Wait() {
        int status = 0;
        while (waitpid(_process, &status, 0) < 0 && errno == EINTR) {
        }
        _process = 0;
        return status;
    }

private:
    pid_t _process;
};

/// What comes out of a descriptor until it is closed at the other end.
/// @return nothing where that takes too long
std::optional<std::string> ReadUntilClosed(base::Descriptor const& descriptor,
                                           std::chrono::seconds patience) {
    auto const deadline = std::chrono::steady_clock::now() + patience;
    std::string text;
    while (true) {
        auto const left = std::chrono::duration_cast<std::chrono::milliseconds>(
            deadline - std::chrono::steady_clock::now());
        pollfd waited = {descriptor.Get(), POLLIN, 0};
        int const ready =
            poll(&waited, 1,
                 static_cast<int>(std::max<std::chrono::milliseconds::rep>(left.count(), 0)));
        if (ready == 0) {
            return std::nullopt;
        }
        char buffer[4096];
        auto const count = ready < 0 ? -1 : read(descriptor.Get(), buffer, sizeof buffer);
        if (count > 0) {
            text.append(buffer, static_cast<std::size_t>(count));
        } else if (count == 0 || errno != EINTR) {
            return text;
        }
    }
}

constexpr std::chrono::seconds patience(60);

} // namespace

std::string RunProgram(std::vector<std::string> arguments) {
    auto const fail = [&](std::string const& reason) {
        throw Failure(ExitCode::failure, "'" + arguments.front() + "' " + reason);
    };
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0) {
        Fail("run", arguments.front(), errno);
    }
    base::Descriptor const output(ends[0]);
    base::Descriptor input(ends[1]);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
    posix_spawn_file_actions_adddup2(&actions, input.Get(), STDERR_FILENO);
    std::vector<char*> words;
    words.reserve(arguments.size() + 1);
    for (auto& argument : arguments) {
        words.push_back(argument.data());
    }
    words.push_back(nullptr);
    std::string settings[] = {"PATH=/usr/sbin:/usr/bin:/sbin:/bin", "LC_ALL=C.UTF-8", "HOME=/root",
                              "DEBIAN_FRONTEND=noninteractive"};
    std::vector<char*> environment;
    environment.reserve(std::size(settings) + 1);
    for (auto& setting : settings) {
        environment.push_back(setting.data());
    }
    environment.push_back(nullptr);
    pid_t process = 0;
    int const error =
        posix_spawn(&process, words.front(), &actions, nullptr, words.data(), environment.data());
    posix_spawn_file_actions_destroy(&actions);
    if (error != 0) {
        Fail("run", arguments.front(), error);
    }
    Child child(process);
    input.Close();
    auto const said = ReadUntilClosed(output, patience);
    if (!said) {
        fail("did not end within " + std::to_string(patience.count()) + " seconds");
    }
    int const status = child.Wait();
    if (!WIFEXITED(status) || WEXITSTATUS(status) != 0) {
        fail("failed: " + *said);
    }
    return *said;
}

SetupFacts ReadSetupFacts(std::string const& provider) {
    RequireProvider(provider);
    SetupFacts facts;
    facts.provider = provider;
    facts.asked = ReadProvidersFile(provider);
    facts.defaultPolicy = ReadDefaultPolicy();
    for (auto const& path : SetupPaths()) {
        facts.texts[path] = TextOnHost(path);
    }
    facts.moduleFolder = "/lib/" TSLAUTH_LIBRARY_ARCHITECTURE "/security";
    facts.missingLinks = MissingLinks(facts.moduleFolder);
    for (auto const* const profile : Paths::Profiles) {
        if (Exists(Paths::ProfileProgram) && Exists(std::string(Paths::ProfileFolder) + profile)) {
            facts.profiles.emplace_back(profile);
        }
    }
    return facts;
}

std::vector<std::string> PathsOfJoinOnHost() {
    auto const provider = ProviderName();
    return provider.empty() ? std::vector<std::string>() : ReadProvidersFile(provider).joinPaths;
}

std::optional<std::string> TextOnHost(std::string const& path) {
    try {
        return base::ReadFile(path);
    } catch (base::FileError const& e) {
        throw Failure(ExitCode::failure, e.what());
    }
}

void PutOnHost(std::string const& path, std::string const& text) {
    try {
        base::ReplaceFile(path, text);
    } catch (base::FileError const& e) {
        throw Failure(ExitCode::failure, e.what());
    }
}

void RemoveFromHost(std::string const& path) {
    if (unlink(path.c_str()) != 0 && errno != ENOENT) {
        Fail("remove", path, errno);
    }
    base::SyncFolderOf(path);
}

std::vector<std::string> MissingFolders(std::string const& path) {
    std::vector<std::string> missing;
    for (auto end = path.find('/', 1); end != std::string::npos; end = path.find('/', end + 1)) {
        if (auto folder = path.substr(0, end); !Exists(folder)) {
            missing.push_back(std::move(folder));
        }
    }
    return missing;
}

void MakeFolder(std::string const& path) {
    if (mkdir(path.c_str(), 0755) != 0 && errno != EEXIST) {
        Fail("make", path, errno);
    }
    base::SyncFolderOf(path);
}

void RemoveEmptyFolder(std::string const& path) {
    if (rmdir(path.c_str()) != 0 && errno != ENOTEMPTY && errno != EEXIST && errno != ENOENT) {
        Fail("remove", path, errno);
    }
    base::SyncFolderOf(path);
}

void MakeLink(std::string const& path, std::string const& target) {
    if (symlink(target.c_str(), path.c_str()) != 0) {
        Fail("make", path, errno);
    }
    base::SyncFolderOf(path);
}

void SwitchProfiles(std::vector<std::string> const& on, std::vector<std::string> const& off) {
    std::vector<std::string> arguments = {Paths::ProfileProgram};
    auto const add = [&](char const* option, std::vector<std::string> const& profiles) {
        if (!profiles.empty()) {
            arguments.emplace_back(option);
            arguments.insert(arguments.end(), profiles.begin(), profiles.end());
        }
    };
    add("--enable", on);
    add("--disable", off);
    (void)RunProgram(std::move(arguments)); // it warns of what is looked at afterwards
}

} // namespace tessel::tslauthctl
