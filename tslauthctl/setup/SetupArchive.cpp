// SPDX-License-Identifier: Apache-2.0
#include "setup/SetupArchive.h"

#include "setup/SetupHost.h"
#include "setup/SetupPaths.h"
#include "terminal/Console.h"

#include <filesystem>
#include <system_error>

namespace tessel::tslauthctl {

namespace {

std::string DocumentPath() {
    return std::string(Paths::SetupRecord) + "/record.json";
}

void Keep(std::string const& path, std::string const& text) {
    for (auto const& folder : MissingFolders(path)) {
        MakeFolder(folder);
    }
    PutOnHost(path, text);
}

std::string ReadCopy(std::string const& path) {
    auto text = TextOnHost(path);
    if (!text) {
        throw Failure(ExitCode::failure,
                      "'" + path + "' is missing, which says what the host was before");
    }
    return std::move(*text);
}

} // namespace

std::optional<SetupRecord> ReadSetupRecord() {
    auto const document = TextOnHost(DocumentPath());
    if (!document) {
        return std::nullopt;
    }
    SetupRecord record;
    try {
        record = RecordIn(nlohmann::json::parse(*document));
    } catch (nlohmann::json::exception const& e) {
        throw Failure(ExitCode::failure, "'" + DocumentPath() + "' cannot be read: " + e.what());
    }
    for (auto& file : record.files) {
        if (file.before) {
            file.before = ReadCopy(KeptOriginal(file.path));
        }
        file.after = ReadCopy(SetUpCopy(file.path));
    }
    return record;
}

void WriteSetupRecord(SetupRecord const& record) {
    for (auto const& file : record.files) {
        if (file.before) {
            Keep(KeptOriginal(file.path), *file.before);
        }
        Keep(SetUpCopy(file.path), file.after);
    }
    Keep(DocumentPath(), Described(record).dump(2) + "\n");
}

void RecordChange(std::string const& path, std::string const& text) {
    auto const record = ReadSetupRecord();
    bool const known = record && std::any_of(record->files.begin(), record->files.end(),
                                             [&](auto const& file) { return file.path == path; });
    if (known) {
        Keep(SetUpCopy(path), text);
    }
}

void RemoveSetupRecord() noexcept {
    std::error_code ignored; // what stays says that the host was set up, and can be undone again
    std::filesystem::remove_all(Paths::SetupRecord, ignored);
}

std::string KeptOriginal(std::string const& path) {
    return std::string(Paths::SetupRecord) + "/before" + path;
}

std::string SetUpCopy(std::string const& path) {
    return std::string(Paths::SetupRecord) + "/after" + path;
}

std::vector<std::string> SetupRecordPaths() {
    std::vector<std::string> paths = {DocumentPath()};
    for (auto const& path : SetupPaths()) {
        paths.push_back(KeptOriginal(path));
        paths.push_back(SetUpCopy(path));
    }
    return paths;
}

} // namespace tessel::tslauthctl
