// SPDX-License-Identifier: Apache-2.0
#include "host/FolderSnapshot.h"

#include <filesystem>
#include <system_error>
#include <utility>

namespace tessel::winbind {

namespace {

/// Everything in a folder, parents first.
std::vector<std::string> PathsIn(std::string const& folder) {
    std::vector<std::string> paths;
    std::error_code error;
    for (std::filesystem::recursive_directory_iterator entry(folder, error), end;
         !error && entry != end; entry.increment(error)) {
        paths.push_back(entry->path().string());
    }
    return paths;
}

} // namespace

FolderSnapshot::FolderSnapshot(std::vector<std::string> folders) : _folders(std::move(folders)) {
    for (std::string const& folder : _folders) {
        std::error_code error;
        if (std::filesystem::exists(folder, error)) {
            _paths.insert(folder);
        }
        auto const paths = PathsIn(folder);
        _paths.insert(paths.begin(), paths.end());
    }
}

void FolderSnapshot::RemoveNewFiles() const noexcept {
    try {
        for (std::string const& folder : _folders) {
            std::vector<std::string> paths = PathsIn(folder);
            paths.insert(paths.begin(), folder);
            for (auto path = paths.rbegin(); path != paths.rend(); ++path) {
                if (_paths.count(*path) == 0) {
                    std::error_code ignored; // a folder in which something old lies, or nothing
                    std::filesystem::remove(*path, ignored);
                }
            }
        }
    } catch (std::exception const&) {
        // Out of memory: what is left are files that Samba makes whenever it runs.
    }
}

} // namespace tessel::winbind
