// SPDX-License-Identifier: Apache-2.0
#include "analysis/HostFile.h"
#include "analysis/Prepare.h"
#include "terminal/UnifiedDiff.h"
#include "verbs/HostChange.h"
#include "verbs/Verbs.h"

#include <base/FileError.h>
#include <base/WholeFile.h>
#include <tslauth/ActiveDirectoryStore.h>
#include <tslauth/Exceptions.h>
#include <tslauth/Paths.h>

#include <cerrno>
#include <fcntl.h>
#include <unistd.h>

namespace tessel::tslauthctl {

namespace {

using namespace authentication;

/// Keeps the file as it is under a name beside it: FILE.tslauth-orig, or with a number behind it
/// where that is taken. A second name for the same file, so that owner, mode and everything else
/// stay its own.
std::string KeepOriginal(std::string const& path) {
    for (int number = 0;; ++number) {
        auto kept = path + ".tslauth-orig";
        if (number > 0) {
            kept += "." + std::to_string(number);
        }
        if (linkat(AT_FDCWD, path.c_str(), AT_FDCWD, kept.c_str(), AT_SYMLINK_FOLLOW) == 0) {
            return kept;
        }
        if (int const error = errno; error != EEXIST) {
            throw IOError("Cannot keep the original as '" + kept + "': " + base::SystemText(error));
        }
    }
}

/// Replaces the file, which stays what it was in all but its text.
/// @return the name of the original
std::string Write(std::string const& path, std::string const& text) {
    auto kept = KeepOriginal(path);
    try {
        base::ReplaceFile(path, text);
    } catch (base::FileError const& e) {
        throw IOError(e.what());
    }
    return kept;
}

nlohmann::json Described(std::vector<PreparedLine> const& lines) {
    auto described = nlohmann::json::array();
    for (auto const& line : lines) {
        described.push_back({{"line", line.number},
                             {"before", line.before},
                             {"after", line.after},
                             {"reason", line.reason}});
    }
    return described;
}

std::string Place(std::string const& path, PreparedLine const& line) {
    return line.number > 0 ? path + ":" + std::to_string(line.number) : path;
}

/// Enough of a line to know it by.
std::string Shortened(std::string const& line) {
    constexpr std::size_t most = 100;
    return line.size() > most ? line.substr(0, most) + "..." : line;
}

/// What is to become of one file.
struct PreparedFile {
    std::string path;
    std::string before;
    Prepared prepared;

    bool Changes() const {
        return prepared.text != before;
    }
};

void Describe(PreparedFile const& file, bool write, Console& console) {
    auto const diff = UnifiedDiff(file.path, file.before, file.prepared.text);
    console.Diff(diff);
    for (auto const& edit : file.prepared.edits) {
        console.Note(Place(file.path, edit) + ": " + edit.reason);
    }
    for (auto const& finding : file.prepared.impossible) {
        console.Warning(Place(file.path, finding) + ": no lossless edit exists" +
                        (finding.before.empty() ? "" : " for '" + Shortened(finding.before) + "'") +
                        ": " + finding.reason);
    }
    nlohmann::json original = nullptr;
    if (write && file.Changes()) {
        original = Write(file.path, file.prepared.text);
        console.Line("changed " + file.path + "; the original is " + original.get<std::string>());
    }
    console.Document()["files"].push_back({{"path", file.path},
                                           {"changed", file.Changes()},
                                           {"diff", diff},
                                           {"edits", Described(file.prepared.edits)},
                                           {"impossible", Described(file.prepared.impossible)},
                                           {"original", original}});
}

/// The configured provider's entries, or such as any provider might bring.
ProviderEntries EntriesToCarry(Console& console) {
    try {
        return ActiveDirectoryStore(0).GetProviderEntries();
    } catch (std::exception const& e) {
        console.Note(std::string("no provider can be loaded, one is assumed: ") + e.what());
        return PlaceholderEntries();
    }
}

ExitCode Prepare(bool write, bool acceptLoss, Console& console) {
    auto const entries = EntriesToCarry(console);
    auto const policy = ReadHostFile(Paths::PAMPolicy);
    auto const services = ReadHostFile(Paths::NSSConfiguration);
    PreparedFile const files[] = {
        {Paths::PAMPolicy, policy, PreparePAM(policy, entries, HostFileOrNothing, acceptLoss)},
        {Paths::NSSConfiguration, services, PrepareNSS(services, entries, acceptLoss)}};
    bool changes = false;
    bool loses = false;
    for (auto const& file : files) {
        changes = changes || file.Changes();
        loses = loses || !file.prepared.impossible.empty();
    }
    // A file that cannot be carried anyhow is not changed half way.
    bool const refused = loses && !acceptLoss;
    auto& document = console.Document();
    document["written"] = write && !refused;
    document["files"] = nlohmann::json::array();
    for (auto const& file : files) {
        Describe(file, write && !refused, console);
    }
    if (refused) {
        if (write) {
            console.Line(
                "Nothing was changed. With --accept-loss the files are edited all the same.");
        }
        return ExitCode::loss;
    }
    if (!changes) {
        console.Line("Nothing has to be prepared.");
    }
    return changes && !write ? ExitCode::changes : ExitCode::done;
}

} // namespace

ExitCode RunPrepare(bool write, bool acceptLoss, Console& console) {
    if (!write) {
        return Prepare(write, acceptLoss, console);
    }
    RequireRoot("prepare --write");
    HostChange const change(console);
    return Prepare(write, acceptLoss, console);
}

} // namespace tessel::tslauthctl
