// SPDX-License-Identifier: Apache-2.0
#include "LosslessPAMPolicy.h"

#include "WholeLines.h"
#include "systemconfiguration/PAMPolicyText.h"
#include "systemconfiguration/PAMReader.h"
#include "systemconfiguration/Words.h"

#include <meaning/PAMMeaning.h>
#include <tslauth/Exceptions.h>
#include <tslauth/Paths.h>

#include <algorithm>
#include <cstddef>
#include <optional>
#include <string>
#include <vector>

namespace tessel::authentication::ProviderModules {

using namespace SystemConfiguration;

namespace {

std::string const& AccessModule() {
    static std::string const module = std::string(Paths::PAMModulePrefix) + Paths::PAMAccessModule;
    return module;
}

/// The lines of the file that hold one entry.
struct Place {
    std::size_t begin;
    std::size_t end;
    bool isTheEntry;
    bool isAccess;
};

/// What one reader sees of a policy.
struct View {
    /// The entries of the facility in question.
    std::vector<Place> stack;
    /// The start of the first line of any facility; the end of the text where there is none.
    std::size_t firstEntry;
};

/// Nothing where the model cannot read the text.
std::optional<View> ModelView(std::string_view text, PAMFacility::Facility facility,
                              PAMEntry const& entry) {
    View view{{}, text.size()};
    TextInput in(text);
    try {
        while (MoveToEntry(in)) {
            auto const begin = LineStart(text, in.Position());
            view.firstEntry = std::min(view.firstEntry, begin);
            auto line = ReadEntryLine(in);
            if (line.facility != facility) {
                continue;
            }
            PAMEntry read(std::move(line.control), std::string(line.module));
            ReadParameters(line.parameters, read.parameters());
            view.stack.push_back(
                {begin, in.Position(), read == entry, read.module() == AccessModule()});
        }
    } catch (InvalidFacilityException const&) {
        return std::nullopt;
    } catch (InvalidControlException const&) {
        return std::nullopt;
    }
    return view;
}

View SystemView(std::string_view text, PAMFacility::Facility facility, PAMEntry const& entry) {
    std::vector<std::size_t> starts;
    for (std::size_t at = 0; at < text.size();) {
        starts.push_back(at);
        auto const feed = text.find('\n', at);
        at = feed == std::string_view::npos ? text.size() : feed + 1;
    }
    starts.push_back(text.size());

    auto const word = std::string(Words::WordOf<PAMFacility>(facility));
    auto const meaning = meaning::ReadPAMMeaning(text);
    auto const sought = Meaning(entry, word);
    View view{{}, meaning.lines.empty() ? text.size() : starts[meaning.lines.front().first - 1]};
    for (auto const& line : meaning::PAMStackOf(meaning, word)) {
        view.stack.push_back({starts[line.first - 1], starts[line.last], line == sought,
                              line.module == AccessModule()});
    }
    return view;
}

/// The indices of the entry in a stack.
using Indices = std::vector<std::size_t>;

Indices IndicesOfTheEntry(View const& view) {
    Indices indices;
    for (std::size_t i = 0; i < view.stack.size(); ++i) {
        if (view.stack[i].isTheEntry) {
            indices.push_back(i);
        }
    }
    return indices;
}

/// Where the entry belongs in a stack without one.
std::size_t IndexForTheEntry(View const& view) {
    auto const access = std::find_if(view.stack.begin(), view.stack.end(),
                                     [](Place const& place) { return place.isAccess; });
    return access == view.stack.end() ? 0
                                      : static_cast<std::size_t>(access - view.stack.begin()) + 1;
}

/// The position in the text that goes with an index for the entry.
std::size_t PositionOf(std::size_t index, View const& view) {
    if (index > 0) {
        return view.stack[index - 1].end;
    }
    return view.stack.empty() ? view.firstEntry : view.stack.front().begin;
}

std::string WithEntry(std::string const& text, PAMFacility::Facility facility,
                      PAMEntry const& entry) {
    auto const model = ModelView(text, facility, entry);
    auto const view = model ? *model : SystemView(text, facility, entry);
    if (!IndicesOfTheEntry(view).empty()) {
        return text;
    }
    PAMStack stack(facility);
    stack.push_back(entry);
    std::string line;
    PrintStack(stack, line);
    return WithLines(text, PositionOf(IndexForTheEntry(view), view), line);
}

std::string WithoutEntry(std::string text, View const& view) {
    for (auto place = view.stack.rbegin(); place != view.stack.rend(); ++place) {
        if (place->isTheEntry) {
            text = WithoutLines(text, place->begin, std::min(place->end, text.size()));
        }
    }
    return text;
}

/// Whether both readers find in `after` the entry that was to be inserted into `before`.
bool BothFind(std::string_view before, std::string_view after, PAMFacility::Facility facility,
              PAMEntry const& entry) {
    if (IndicesOfTheEntry(SystemView(after, facility, entry)).empty()) {
        return false;
    }
    auto const made = ModelView(after, facility, entry);
    if (!made) {
        return true;
    }
    auto const was = ModelView(before, facility, entry);
    auto expected = was ? IndicesOfTheEntry(*was) : Indices();
    if (expected.empty()) {
        expected = {IndexForTheEntry(was ? *was : *made)};
    }
    return IndicesOfTheEntry(*made) == expected;
}

} // namespace

std::string LosslessPAMPolicy(std::string_view text, Edit edit, PAMEntry const& entry) {
    std::string edited(text);
    switch (edit) {
    case Edit::insert:
        RefuseNul(text);
        if (meaning::ReadPAMMeaning(text).unreadable) {
            throw ConfigurationError("libpam refuses the policy: its last line is continued, or a "
                                     "line is too long");
        }
        for (auto const facility : EditedFacilities) {
            edited = WithEntry(edited, facility, entry);
        }
        for (auto const facility : EditedFacilities) {
            if (!BothFind(text, edited, facility, entry)) {
                throw ConfigurationError("The entry of '" + entry.module() + "' for '" +
                                         std::string(Words::WordOf<PAMFacility>(facility)) +
                                         "' has no place where all readers of the policy find it");
            }
        }
        break;
    case Edit::remove:
        for (auto const facility : EditedFacilities) {
            edited = WithoutEntry(edited, SystemView(edited, facility, entry));
            if (auto const view = ModelView(edited, facility, entry)) {
                edited = WithoutEntry(edited, *view);
            }
        }
        break;
    }
    return edited;
}

} // namespace tessel::authentication::ProviderModules
