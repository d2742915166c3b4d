// SPDX-License-Identifier: Apache-2.0
#include "ControlLock.h"
#include "Host.h"
#include "Prepare.h"
#include "Text.h"
#include "UnifiedDiff.h"
#include "Verbs.h"

#include <Paths.h>
#include <SystemFile.h>

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace tessel::tslauthctl {

namespace {

using namespace authentication;

/// Keeps the file as it is under a name beside it: FILE.tslauth-orig, or with a number behind it
/// where that is taken. A second name for the same file, so that owner, mode and everything else
/// stay its own.
std::string KeepOriginal(std::string const& path) {
    for (int number = 0;; ++number) {
        auto const kept =
            path + ".tslauth-orig" + (number > 0 ? "." + std::to_string(number) : std::string());
        if (linkat(AT_FDCWD, path.c_str(), AT_FDCWD, kept.c_str(), AT_SYMLINK_FOLLOW) == 0) {
            return kept;
        }
        if (int const error = errno; error != EEXIST) {
            ThrowIOError("Cannot keep '" + path + "' as '" + kept + "'", error);
        }
    }
}

/// Replaces the file and keeps its owner; the mode is kept by the replacing itself.
std::string Write(std::string const& path, std::string const& text) {
    struct stat status = {};
    if (stat(path.c_str(), &status) != 0) {
        ThrowIOError("Cannot open '" + path + "'", errno);
    }
    auto kept = KeepOriginal(path);
    ReplaceFile(path, text);
    if (status.st_uid != geteuid() || status.st_gid != getegid()) {
        if (chown(path.c_str(), status.st_uid, status.st_gid) != 0) {
            ThrowIOError("Cannot give '" + path + "' its owner back", errno);
        }
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

struct Outcome {
    bool changes = false;
    bool loses = false;
};

void PrepareFile(std::string const& path, std::string const& before, Prepared const& prepared,
                 bool write, Output& output, Outcome& outcome) {
    bool const changes = prepared.text != before;
    auto const diff = UnifiedDiff(path, before, prepared.text);
    output.Diff(diff);
    for (auto const& edit : prepared.edits) {
        output.Note(Place(path, edit) + ": " + edit.reason);
    }
    for (auto const& finding : prepared.impossible) {
        output.Warning(Place(path, finding) + ": no lossless edit exists" +
                       (finding.before.empty() ? "" : " for '" + finding.before + "'") + ": " +
                       finding.reason);
    }
    nlohmann::json original = nullptr;
    if (changes && write) {
        original = Write(path, prepared.text);
        output.Line("changed " + path + "; the original is " + original.get<std::string>());
    }
    output.Document()["files"].push_back({{"path", path},
                                          {"changed", changes},
                                          {"diff", diff},
                                          {"edits", Described(prepared.edits)},
                                          {"impossible", Described(prepared.impossible)},
                                          {"original", original}});
    outcome.changes = outcome.changes || changes;
    outcome.loses = outcome.loses || !prepared.impossible.empty();
}

/// The configured provider's entries, or such as any provider might bring.
ProviderEntries EntriesToCarry(Output& output) {
    try {
        return LoadProvider();
    } catch (std::exception const& e) {
        output.Note(std::string("no provider can be loaded, one is assumed: ") + e.what());
        return PlaceholderEntries();
    }
}

ExitCode Prepare(bool write, bool acceptLoss, Output& output) {
    auto const entries = EntriesToCarry(output);
    auto& document = output.Document();
    document["written"] = write;
    document["files"] = nlohmann::json::array();
    Outcome outcome;
    auto const policy = ReadFile(Paths::PAMPolicy);
    auto const services = ReadFile(Paths::NSSConfiguration);
    PrepareFile(Paths::PAMPolicy, policy, PreparePAM(policy, entries, ReadPolicy, acceptLoss),
                write, output, outcome);
    PrepareFile(Paths::NSSConfiguration, services, PrepareNSS(services, entries, acceptLoss), write,
                output, outcome);
    if (outcome.loses && !acceptLoss) {
        return ExitCode::loss;
    }
    if (outcome.changes && !write) {
        return ExitCode::changes;
    }
    if (!outcome.changes) {
        output.Line("Nothing has to be prepared.");
    }
    return ExitCode::done;
}

} // namespace

ExitCode RunPrepare(bool write, bool acceptLoss, Output& output) {
    if (!write) {
        return Prepare(write, acceptLoss, output);
    }
    RequireRoot("prepare --write");
    ControlLock const lock(output);
    return Prepare(write, acceptLoss, output);
}

} // namespace tessel::tslauthctl
