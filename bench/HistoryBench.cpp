// SPDX-License-Identifier: Apache-2.0
#include "Cases.h"
#include "Files.h"
#include "Host.h"

#include <history/HistoryArchive.h>
#include <history/HistoryPaths.h>
#include <history/PathOnHost.h>

#include <base/WholeFile.h>
#include <filesystem>

namespace bench {

namespace {

using namespace tessel::tslauthctl;

/// What every command that changes the host waits for first.
void KeepHost(std::vector<std::string> const& paths) {
    Snapshot snapshot;
    MakeHistoryFolder();
    snapshot.before = StatesOnHost(paths);
    KeepSnapshot(snapshot);
}

/// The files that there are, each whole and durable, and nothing about them.
void CopyFiles(std::vector<std::string> const& paths) {
    auto const folder = std::filesystem::temp_directory_path() / "copies";
    std::filesystem::create_directories(folder);
    int number = 0;
    for (auto const& path : paths) {
        if (std::filesystem::is_regular_file(std::filesystem::symlink_status(path))) {
            auto const text = tessel::base::ReadFile(path);
            tessel::base::ReplaceFile(folder / std::to_string(++number), text.value());
        }
    }
}

Body Doing(void (*keep)(std::vector<std::string> const&)) {
    return [=](benchmark::State& state) {
        Host::MakeInactive();
        Host::ConfigureProvider();
        auto const paths = PathsOfSetup();
        // The twenty before are somebody else's.
        MeasureEach(
            state, [] { std::filesystem::remove_all(HistoryFolder); }, [&] { keep(paths); });
    };
}

} // namespace

void AddHistoryCases(Table& table) {
    table.Add("a snapshot before setup, on tmpfs", {Bar::Of::Time, 2e6}, Clock::Wall, 7,
              {{"ours", Doing(KeepHost), true}, {"copies of the files", Doing(CopyFiles), true}});
}

} // namespace bench
