// SPDX-License-Identifier: Apache-2.0
#include "Edit.h"

#include <filesystem>

namespace bench {

namespace {

using Edit = std::function<void(std::string const& source, std::string const& target)>;

/// Reads one file and replaces another, so that each run finds the same.
Body EditFrom(std::string const& folder, SystemFile const& file, int lines, Edit const& edit) {
    return [=](benchmark::State& state) {
        std::string const source = folder + "/source";
        std::string const target = folder + "/target";
        WriteFile(source, file.text(lines));
        WriteFile(target, {});
        file.ours(source, target);
        std::string const expected = tessel::authentication::ReadFile(target);
        Measure(state, [&] { edit(source, target); });
        ExpectFile(target, expected);
    };
}

Body EditWithAugeas(std::string const& folder, SystemFile const& file, int lines) {
    return [=](benchmark::State& state) {
        std::string const root = folder + "/augeas";
        std::string const path = root + file.name;
        std::filesystem::create_directories(std::filesystem::path(path).parent_path());
        std::string const text = file.text(lines);
        MeasureEach(
            state, [&] { WriteFile(path, text); }, [&] { file.augeas(root); });
        if (tessel::authentication::ReadFile(path).size() <= text.size()) {
            throw std::runtime_error("Augeas has not edited the file");
        }
    };
}

std::string Count(int lines) {
    return lines < 1000 ? std::to_string(lines) : std::to_string(lines / 1000) + ",000";
}

} // namespace

void AddEditCases(Table& table, Places const& places, SystemFile const& file) {
    for (auto const& [place, folder] : places) {
        bool const memory = &place == &places.front().first;
        auto const name = [&, where = place](int lines) {
            return file.title + ", " + Count(lines) + " lines, " + where;
        };
        for (int const lines : {20, 1000, 100000}) {
            double const bar = lines > 20 ? 5 : memory ? 1.4 : 1.1;
            std::vector<Contender> contenders = {
                {"ours", EditFrom(folder, file, lines, file.ours)},
                {"floor", EditFrom(folder, file, lines, file.floor)}};
            if (memory) {
                contenders.push_back({"streams", EditFrom(folder, file, lines, file.streams)});
            }
            // Quadratic: a run at 100,000 lines would take hours.
            if (memory && lines < 100000) {
                contenders.push_back({"Augeas", EditWithAugeas(folder, file, lines), true});
            }
            table.Add(name(lines), {Bar::Of::Ratio, bar}, memory ? Clock::Processor : Clock::Wall,
                      lines > 1000 ? 9 : 15, contenders);
        }
        table.AddGrowth(file.title + ", a line of 100,000 and of 1,000, " + place,
                        {Bar::Of::Ratio, 1.5}, name(1000), 1000, name(100000), 100000);
    }
}

} // namespace bench
