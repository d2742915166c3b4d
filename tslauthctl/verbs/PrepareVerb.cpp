// SPDX-License-Identifier: Apache-2.0
#include "analysis/HostFile.h"
#include "analysis/Prepare.h"
#include "terminal/UnifiedDiff.h"
#include "trial/LogInTrial.h"
#include "verbs/HostChange.h"
#include "verbs/Verbs.h"

#include <base/FileError.h>
#include <base/WholeFile.h>
#include <tslauth/ActiveDirectoryStore.h>
#include <tslauth/Exceptions.h>
#include <tslauth/Paths.h>

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace tessel::tslauthctl {

namespace {

using namespace authentication;

/// A name for the original beside the file: FILE.tslauth-orig, or with a number behind it where
/// that is taken.
std::string NameForOriginal(std::string const& path) {
    auto const first = path + ".tslauth-orig";
    auto name = first;
    struct stat status = {};
    for (int number = 1; lstat(name.c_str(), &status) == 0; ++number) {
        name = first + "." + std::to_string(number);
    }
    return name;
}

/// A second name for the same file, so that owner, mode and everything else stay its own.
void KeepOriginal(std::string const& path, std::string const& name) {
    if (linkat(AT_FDCWD, path.c_str(), AT_FDCWD, name.c_str(), AT_SYMLINK_FOLLOW) != 0) {
        int const error = errno;
        throw IOError("Cannot keep the original as '" + name + "': " + base::SystemText(error));
    }
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
    /// Where what it was is kept; empty where it is not written.
    std::string original;

    bool Changes() const {
        return prepared.text != before;
    }
};

/// Replaces the files that change, which stay what they were in all but their texts.
void Write(std::vector<PreparedFile>& files, HostChange& change, Console& console) {
    std::vector<std::string> paths;
    PlannedTexts texts;
    for (auto& file : files) {
        if (file.Changes()) {
            file.original = NameForOriginal(file.path);
            paths.push_back(file.path);
            paths.push_back(file.original);
            texts[file.path] = file.prepared.text;
        }
    }
    LogInTrial().Require(texts, console);
    change.Write("prepare", paths, [&] {
        for (auto const& file : files) {
            if (file.Changes()) {
                KeepOriginal(file.path, file.original);
                base::ReplaceFile(file.path, file.prepared.text);
            }
        }
    });
}

void Describe(PreparedFile const& file, Console& console) {
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
    if (!file.original.empty()) {
        original = file.original;
        console.Line("changed " + file.path + "; the original is " + file.original);
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

/// @param change of the host; null where it is only shown
ExitCode Prepare(HostChange* change, bool acceptLoss, Console& console) {
    auto const entries = EntriesToCarry(console);
    auto const policy = ReadHostFile(Paths::PAMPolicy);
    auto const services = ReadHostFile(Paths::NSSConfiguration);
    std::vector<PreparedFile> files = {
        {Paths::PAMPolicy, policy, PreparePAM(policy, entries, HostFileOrNothing, acceptLoss), {}},
        {Paths::NSSConfiguration, services, PrepareNSS(services, entries, acceptLoss), {}}};
    bool changes = false;
    bool loses = false;
    for (auto const& file : files) {
        changes = changes || file.Changes();
        loses = loses || !file.prepared.impossible.empty();
    }
    // A file that cannot be carried anyhow is not changed half way.
    bool const refused = loses && !acceptLoss;
    auto& document = console.Document();
    document["written"] = false;
    document["files"] = nlohmann::json::array();
    if (change != nullptr && changes && !refused) {
        Write(files, *change, console);
    }
    document["written"] = change != nullptr && !refused;
    for (auto const& file : files) {
        Describe(file, console);
    }
    if (refused) {
        if (change != nullptr) {
            console.Line(
                "Nothing was changed. With --accept-loss the files are edited all the same.");
        }
        return ExitCode::loss;
    }
    if (!changes) {
        console.Line("Nothing has to be prepared.");
    }
    return changes && change == nullptr ? ExitCode::changes : ExitCode::done;
}

} // namespace

ExitCode RunPrepare(bool write, bool acceptLoss, Console& console) {
    if (!write) {
        return Prepare(nullptr, acceptLoss, console);
    }
    RequireRoot("prepare --write");
    HostChange change(console);
    return Prepare(&change, acceptLoss, console);
}

} // namespace tessel::tslauthctl
