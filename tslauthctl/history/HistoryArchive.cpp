// SPDX-License-Identifier: Apache-2.0
#include "history/HistoryArchive.h"

#include "setup/SetupHost.h"
#include "terminal/Console.h"

#include <base/FileError.h>
#include <base/WholeFile.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <filesystem>
#include <set>
#include <sys/stat.h>
#include <system_error>

namespace tessel::tslauthctl {

namespace {

using Kind = PathState::Kind;

constexpr char document[] = "/record.json";
constexpr char before[] = "/before";
constexpr char after[] = "/after";
constexpr char afterDocument[] = "/after.json";
constexpr mode_t forRoot = 0600;

constexpr char notKept[] = "Nothing was changed, for what the host is cannot be kept";

std::string FolderOf(unsigned number) {
    return std::string(HistoryFolder) + "/" + std::to_string(number);
}

/// Of one that is not finished, and is none if it stays so.
std::string UnfinishedFolder() {
    return std::string(HistoryFolder) + "/" + base::TemporaryPrefix + "new";
}

/// The numbers of all that are there, in order.
std::vector<unsigned> Numbers() {
    std::vector<unsigned> numbers;
    std::error_code error;
    for (std::filesystem::directory_iterator entry(HistoryFolder, error), end;
         !error && entry != end; entry.increment(error)) {
        auto const name = entry->path().filename().string();
        unsigned number = 0;
        auto const [stop, failure] =
            std::from_chars(name.data(), name.data() + name.size(), number);
        if (failure == std::errc() && stop == name.data() + name.size()) {
            numbers.push_back(number);
        }
    }
    if (error && error != std::errc::no_such_file_or_directory) {
        throw Failure(ExitCode::failure,
                      base::FileError("read", HistoryFolder, error.value()).what());
    }
    std::sort(numbers.begin(), numbers.end());
    return numbers;
}

void MakeFolderForRoot(std::string const& path) {
    if (::mkdir(path.c_str(), 0700) != 0 && errno != EEXIST) {
        throw base::FileError("make", path, errno);
    }
}

/// @param made the folders below `folder` that are known to be there
void MakeFoldersAbove(std::string const& path, std::string const& folder,
                      std::set<std::string>& made) {
    for (auto end = path.find('/', folder.size() + 1); end != std::string::npos;
         end = path.find('/', end + 1)) {
        if (auto const above = path.substr(0, end); made.insert(above).second) {
            MakeFolderForRoot(above);
        }
    }
}

void WriteTexts(std::string const& folder, PathStates const& states) {
    std::set<std::string> made = {folder};
    for (auto const& [path, state] : states) {
        if (state.kind == Kind::file) {
            MakeFoldersAbove(folder + path, folder, made);
            base::MakeFile(folder + path, state.text, forRoot);
        }
    }
    for (auto const& each : made) {
        base::SyncFolderOf(each + "/");
    }
}

void ReadTexts(std::string const& folder, PathStates& states) {
    for (auto& [path, state] : states) {
        if (state.kind == Kind::file) {
            auto text = base::ReadFile(folder + path);
            if (!text) {
                throw base::FileError("read", folder + path, ENOENT);
            }
            state.text = std::move(*text);
        }
    }
}

Snapshot ReadSnapshot(unsigned number) {
    auto const folder = FolderOf(number);
    auto const text = base::ReadFile(folder + document);
    if (!text) {
        throw base::FileError("read", folder + document, ENOENT);
    }
    auto snapshot = SnapshotIn(nlohmann::json::parse(*text));
    snapshot.number = number;
    ReadTexts(folder + before, snapshot.before);
    if (auto const written = base::ReadFile(folder + afterDocument)) {
        auto changed = StatesIn(nlohmann::json::parse(*written));
        ReadTexts(folder + after, changed);
        changed.insert(snapshot.before.begin(), snapshot.before.end()); // all others stayed
        snapshot.after = std::move(changed);
    }
    return snapshot;
}

/// One without its document is none, so that a process that is killed meanwhile leaves no half.
void RemoveSnapshot(std::string const& folder) noexcept {
    std::error_code ignored; // what stays is removed with the next one
    std::filesystem::remove(folder + document, ignored);
    std::filesystem::remove_all(folder, ignored);
}

void Prune(std::vector<unsigned> const& numbers) noexcept {
    for (std::size_t i = 0; i + SnapshotsKept < numbers.size(); ++i) {
        RemoveSnapshot(FolderOf(numbers[i]));
    }
}

void Write(Snapshot const& snapshot, std::string const& folder) {
    MakeFolderForRoot(folder);
    MakeFolderForRoot(folder + before);
    WriteTexts(folder + before, snapshot.before);
    base::MakeFile(folder + document, Described(snapshot).dump(2) + "\n", forRoot);
    base::SyncFolderOf(folder + document);
    auto const place = FolderOf(snapshot.number);
    if (::rename(folder.c_str(), place.c_str()) != 0) {
        throw base::FileError("make", place, errno);
    }
    base::SyncFolderOf(place);
}

[[noreturn]] void Fail(std::string const& what, std::exception const& e) {
    throw Failure(ExitCode::failure, what + ": " + e.what());
}

} // namespace

Snapshot const* History::Find(unsigned number) const {
    auto const found =
        std::find_if(snapshots.begin(), snapshots.end(),
                     [&](Snapshot const& snapshot) { return snapshot.number == number; });
    return found == snapshots.end() ? nullptr : &*found;
}

History ReadHistory() {
    History history;
    for (unsigned const number : Numbers()) {
        try {
            history.snapshots.push_back(ReadSnapshot(number));
        } catch (std::bad_alloc const&) {
            throw;
        } catch (std::exception const& e) {
            history.unreadable.push_back("change " + std::to_string(number) +
                                         " cannot be read: " + e.what());
        }
    }
    return history;
}

void MakeHistoryFolder() {
    for (auto const& folder : MissingFolders(std::string(HistoryFolder) + "/")) {
        MakeFolder(folder);
    }
    if (::chmod(HistoryFolder, 0700) != 0) {
        Fail(notKept, base::FileError("make", HistoryFolder, errno));
    }
}

void KeepSnapshot(Snapshot& snapshot) {
    auto const unfinished = UnfinishedFolder();
    try {
        RemoveSnapshot(unfinished);
        auto numbers = Numbers();
        snapshot.number = numbers.empty() ? 1 : numbers.back() + 1;
        Write(snapshot, unfinished);
        numbers.push_back(snapshot.number);
        Prune(numbers);
    } catch (std::exception const& e) {
        RemoveSnapshot(unfinished);
        Fail(notKept, e);
    }
}

void FinishSnapshot(Snapshot const& snapshot) {
    auto const folder = FolderOf(snapshot.number);
    try {
        auto const changed = Differing(snapshot.before, *snapshot.after);
        MakeFolderForRoot(folder + after);
        WriteTexts(folder + after, changed);
        base::ReplaceFile(folder + afterDocument, Described(changed).dump(2) + "\n",
                          {base::Links::Replace, forRoot});
    } catch (std::exception const& e) {
        Fail("What the change has made of the host cannot be kept", e);
    }
}

void DropSnapshot(Snapshot const& snapshot) noexcept {
    RemoveSnapshot(FolderOf(snapshot.number));
}

} // namespace tessel::tslauthctl
