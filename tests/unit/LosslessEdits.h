// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_UNIT_LOSSLESSEDITS_H
#define TESTS_UNIT_LOSSLESSEDITS_H

#include "SystemFileModels.h"

#include "lossless/LosslessNSSConfiguration.h"
#include "lossless/LosslessPAMPolicy.h"

#include <tslauth/Exceptions.h>

#include <cstddef>
#include <random>
#include <string>
#include <vector>

/// What holds of a lossless edit whatever the text, for the tests and the fuzz targets alike.
namespace LosslessEdits {

using namespace SystemConfiguration;
using namespace tessel::authentication::ProviderModules;
using SystemFileModels::Describe;

struct PAM : SystemFileModels::PAM {
    static PAMEntry const& Inserted() {
        static auto const entry = PAMEntryFor("pam_ad.so", {"debug", "try=2"});
        return entry;
    }
    static std::string Lossless(std::string const& text, Edit edit) {
        return LosslessPAMPolicy(text, edit, Inserted());
    }
    /// Everything: the entries of all facilities.
    static std::string Summary(Model const& policy) {
        return Describe(policy);
    }
};

struct NSS : SystemFileModels::NSS {
    static NSSService const& Inserted() {
        static auto const service = NSSServiceFor("ad", {});
        return service;
    }
    static std::string Lossless(std::string const& text, Edit edit) {
        return LosslessNSSConfiguration(text, edit, Inserted());
    }
    /// The provider's service as the only mark among dots, a line for each edited database; then
    /// all of the others. What stands behind a bracket the model reads according to where the
    /// bracket stands, and a database without a line has a default that the model does not know.
    static std::string Summary(Model configuration) {
        std::string summary;
        for (auto const database : EditedDatabases) {
            for (auto const& service : configuration[database]) {
                summary += service == Inserted() ? 'x' : '.';
            }
            summary.erase(summary.find_last_of("x\n") + 1);
            summary += '\n';
            configuration[database].clear();
        }
        return summary + Describe(configuration);
    }
};

enum class Outcome { refused, unreadable, compared, broken };

/// What the model makes of `text` after some edits, as the stores do; the reader's failure where it
/// does not read the text.
template <typename Kind>
std::string ThroughTheModel(std::string const& text, std::vector<Edit> const& edits) {
    typename Kind::Model model;
    auto const failure = SystemFileModels::Failure([&] {
        Kind::Read(text, model);
        for (auto const edit : edits) {
            Apply(edit, Kind::Inserted(), model);
        }
    });
    return failure.empty() ? Kind::Summary(model) : failure;
}

template <typename Kind> bool ModelReads(std::string const& text) {
    return SystemFileModels::Failure([&] {
               typename Kind::Model model;
               Kind::Read(text, model);
           })
        .empty();
}

/// @param broken the claim that does not hold
template <typename Kind> Outcome Judge(std::string const& text, std::string& broken) {
    std::string made;
    try {
        made = Kind::Lossless(text, Edit::insert);
    } catch (tessel::authentication::ConfigurationError const&) {
        return Outcome::refused;
    }
    auto const claim = [&](char const* what, std::string const& left, std::string const& right) {
        if (left != right && broken.empty()) {
            broken = std::string(what) + "\n--- of\n" + text + "\n--- one\n" + left +
                     "\n--- other\n" + right;
        }
    };
    claim("inserting twice is inserting once", Kind::Lossless(made, Edit::insert), made);
    if (Kind::Lossless(text, Edit::remove) == text) {
        claim("removing undoes inserting", Kind::Lossless(made, Edit::remove), text);
    }
    bool const compared = ModelReads<Kind>(made);
    if (compared) {
        // Where the model cannot read the text itself, nothing is left to insert.
        auto const& origin = ModelReads<Kind>(text) ? text : made;
        claim("the model finds what a store would have inserted, in the same places",
              ThroughTheModel<Kind>(made, {}), ThroughTheModel<Kind>(origin, {Edit::insert}));
        claim("a store takes it out", ThroughTheModel<Kind>(made, {Edit::remove}),
              ThroughTheModel<Kind>(origin, {Edit::insert, Edit::remove}));
    }
    if (!broken.empty()) {
        return Outcome::broken;
    }
    return compared ? Outcome::compared : Outcome::unreadable;
}

/// How many of several texts came out how, and the first claim that one of them broke.
template <typename Kind> struct Tally {
    std::size_t refused = 0;
    std::size_t unreadable = 0;
    std::size_t compared = 0;
    std::string broken;

    void Add(std::string const& text) {
        switch (Judge<Kind>(text, broken)) {
        case Outcome::refused:
            ++refused;
            break;
        case Outcome::unreadable:
            ++unreadable;
            break;
        case Outcome::compared:
            ++compared;
            break;
        case Outcome::broken:
            break;
        }
    }
};

/// Texts of `usual` lines; every second with `rare` ones among them.
template <typename Kind>
Tally<Kind> JudgeGenerated(std::vector<std::string> const& usual,
                           std::vector<std::string> const& rare) {
    std::mt19937 random(1);
    auto all = usual;
    all.insert(all.end(), rare.begin(), rare.end());
    Tally<Kind> tally;
    for (int i = 0; i < 4000; ++i) {
        tally.Add(SystemFileModels::RandomText(random, i % 2 == 0 ? all : usual, random() % 10));
    }
    return tally;
}

} // namespace LosslessEdits

#endif
