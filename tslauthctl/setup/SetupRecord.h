// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_SETUPRECORD_H
#define TSLAUTHCTL_SETUPRECORD_H

#include <nlohmann/json.hpp>

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

/// What a host was before it was set up, so that it can be so again. No file is opened here.
namespace tessel::tslauthctl {

struct RecordedFile {
    std::string path;
    /// Nothing where there was no file.
    std::optional<std::string> before;
    /// What setting up made of it; what the tool itself has made of it since.
    std::string after;
};

struct SetupRecord {
    std::string provider;
    std::vector<RecordedFile> files;
    /// Links and folders that were made, in the order in which they were.
    std::vector<std::string> links;
    std::vector<std::string> folders;
    std::vector<std::string> profilesOn;
    /// Only those that were on before.
    std::vector<std::string> profilesOff;

    RecordedFile* Find(std::string const& path);

    /// Remembers a file that is going to be written. What it was before stays what it was the first
    /// time.
    void Add(std::string const& path, std::optional<std::string> const& before,
             std::string const& after);
};

/// Everything but the texts of the files, which have files of their own: bytes are bytes there.
nlohmann::json Described(SetupRecord const& record);
/// @throws nlohmann::json::exception
SetupRecord RecordIn(nlohmann::json const& document);

enum class UndoKind {
    /// It is as it was before.
    asBefore,
    /// It is as it was set up, or gone: it becomes what it was.
    restore,
    /// It is as it was set up, and was not there before.
    remove,
    /// It was changed since, and stays.
    changedSince,
    /// It was not there before, and stays for who still goes by it.
    inUse
};

struct FileUndo {
    std::string path;
    UndoKind kind = UndoKind::asBefore;
    /// The lines that came and went since it was set up.
    std::size_t added = 0;
    std::size_t removed = 0;
};

/// @param current nothing where there is no file
FileUndo UndoOf(RecordedFile const& file, std::optional<std::string> const& current);

} // namespace tessel::tslauthctl

#endif
