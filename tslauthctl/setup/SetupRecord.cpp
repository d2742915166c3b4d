// SPDX-License-Identifier: Apache-2.0
#include "setup/SetupRecord.h"

#include "terminal/UnifiedDiff.h"

#include <base/AsciiText.h>

#include <algorithm>
#include <string_view>

namespace tessel::tslauthctl {

namespace {

constexpr int formatVersion = 1;

/// Counts what came and what went, below the two lines that name the file.
void CountLines(std::string_view diff, FileUndo& undo) {
    for (std::size_t line = 0; !diff.empty(); ++line) {
        char const first = base::AsciiText::TakeLine(diff).front();
        undo.added += line > 1 && first == '+' ? 1U : 0U;
        undo.removed += line > 1 && first == '-' ? 1U : 0U;
    }
}

} // namespace

RecordedFile* SetupRecord::Find(std::string const& path) {
    auto const found = std::find_if(files.begin(), files.end(),
                                    [&](RecordedFile const& file) { return file.path == path; });
    return found == files.end() ? nullptr : &*found;
}

void SetupRecord::Add(std::string const& path, std::optional<std::string> const& before,
                      std::string const& after) {
    if (auto* const known = Find(path)) {
        known->after = after;
    } else {
        files.push_back({path, before, after});
    }
}

nlohmann::json Described(SetupRecord const& record) {
    auto files = nlohmann::json::array();
    for (auto const& file : record.files) {
        files.push_back({{"path", file.path}, {"existed", file.before.has_value()}});
    }
    return {{"version", formatVersion},
            {"provider", record.provider},
            {"files", files},
            {"links", record.links},
            {"folders", record.folders},
            {"profilesOn", record.profilesOn},
            {"profilesOff", record.profilesOff}};
}

SetupRecord RecordIn(nlohmann::json const& document) {
    SetupRecord record;
    record.provider = document.at("provider");
    for (auto const& file : document.at("files")) {
        RecordedFile recorded;
        recorded.path = file.at("path");
        if (file.at("existed").get<bool>()) {
            recorded.before.emplace();
        }
        record.files.push_back(std::move(recorded));
    }
    document.at("links").get_to(record.links);
    document.at("folders").get_to(record.folders);
    document.at("profilesOn").get_to(record.profilesOn);
    document.at("profilesOff").get_to(record.profilesOff);
    return record;
}

FileUndo UndoOf(RecordedFile const& file, std::optional<std::string> const& current) {
    FileUndo undo{file.path, UndoKind::changedSince};
    if (current == file.before) {
        undo.kind = UndoKind::asBefore;
    } else if (!current || *current == file.after) {
        undo.kind = file.before ? UndoKind::restore : UndoKind::remove;
    } else {
        CountLines(UnifiedDiff(file.path, file.after, *current), undo);
    }
    return undo;
}

} // namespace tessel::tslauthctl
