// SPDX-License-Identifier: Apache-2.0
#include "samba/DirectorySearch.h"

#include "Failure.h"
#include "Paths.h"
#include "host/Host.h"
#include "host/StagingFolder.h"
#include "text/ToolFailure.h"
#include <base/AsciiText.h>

namespace tessel::winbind {

std::string ValueIn(DirectoryEntry const& entry, std::string const& attribute) {
    auto const found = entry.find(attribute);
    return found == entry.end() ? std::string() : found->second;
}

std::vector<DirectoryEntry> ReadDirectoryEntries(std::string_view text) {
    // "Got 2 replies", and then for each of them an empty line and its "name: value" lines.
    std::vector<DirectoryEntry> entries;
    bool hasBegun = false;
    while (!text.empty()) {
        std::string_view line = base::AsciiText::TakeLine(text);
        line.remove_suffix(base::AsciiText::EndsWith(line, "\n") ? 1 : 0);
        std::size_t const colon = line.find(": ");
        if (base::AsciiText::StartsWith(line, "Got ")) {
            hasBegun = true;
            entries.clear();
        } else if (line.empty()) {
            if (hasBegun && (entries.empty() || !entries.back().empty())) {
                entries.emplace_back();
            }
        } else if (!entries.empty() && colon != std::string_view::npos) {
            entries.back().emplace(line.substr(0, colon), line.substr(colon + 2));
        }
    }
    if (!entries.empty() && entries.back().empty()) {
        entries.pop_back();
    }
    return entries;
}

std::vector<DirectoryEntry> SearchDirectory(Host const& host, std::string const& controller,
                                            std::string const& filter,
                                            std::vector<std::string> const& attributes,
                                            Clock::time_point deadline) {
    // What `net` remembers is its own: in the lock folder of the host, winbindd and every later
    // `net` would go on for a minute without a controller that has not answered once.
    StagingFolder const scratch(host.At(Paths::Staging));
    ChildProcess::Task task{
        {"net", "ads", "search", "--machine-pass", "--option=lock directory=" + scratch.Memory()}};
    if (!controller.empty()) {
        task.arguments.insert(task.arguments.end(), {"-S", controller});
    }
    task.arguments.push_back(filter);
    task.arguments.insert(task.arguments.end(), attributes.begin(), attributes.end());
    ChildProcess::Outcome const outcome = host.Run(task, deadline);
    if (outcome.timedOut) {
        throw Failure(TSLAUTH_PROVIDER_TIMED_OUT,
                      "net ads search " + filter + ": no answer in time");
    }
    if (outcome.code != 0) {
        throw Failure(ToolFailureCode(outcome.output),
                      "net ads search " + filter + ": " + ToolFailureText(outcome.output));
    }
    return ReadDirectoryEntries(outcome.output);
}

} // namespace tessel::winbind
