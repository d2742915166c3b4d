// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_UNIT_SYSTEMFILEMODELS_H
#define TESTS_UNIT_SYSTEMFILEMODELS_H

#include <tslauth/systemconfiguration/NSSConfiguration.h>
#include <tslauth/systemconfiguration/PAMPolicy.h>

#include "systemconfiguration/NSSConfigurationText.h"
#include "systemconfiguration/PAMPolicyText.h"

#include <list>
#include <random>
#include <sstream>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

/// What the tests and the fuzz targets of the system-file models share: reading and printing in
/// both ways, and saying exactly what was read and how it ended.
namespace SystemFileModels {

using namespace SystemConfiguration;

/// How a reading or printing ended, with the class and text of what it threw; empty for success.
template <typename Action> std::string Failure(Action const& action) {
    try {
        action();
    } catch (InvalidControlException const& error) {
        return std::string("InvalidControlException: ") + error.what();
    } catch (InvalidFacilityException const& error) {
        return std::string("InvalidFacilityException: ") + error.what();
    } catch (InvalidDatabaseException const& error) {
        return std::string("InvalidDatabaseException: ") + error.what();
    } catch (std::out_of_range const& error) {
        return std::string("std::out_of_range: ") + error.what();
    }
    return {};
}

inline void Describe(std::list<std::string> const& parameters, std::string& out) {
    for (auto const& parameter : parameters) {
        out += "{" + parameter + "}";
    }
}

/// Every field, in a form that also shows what printing cannot or would not.
inline std::string Describe(PAMPolicy const& policy) {
    std::string out;
    for (auto const& [facility, stack] : policy.Stacks()) {
        out += std::to_string(static_cast<int>(PAMFacility::Facility(facility))) + "/" +
               std::to_string(static_cast<int>(PAMFacility::Facility(stack.Facility()))) + ":\n";
        for (auto const& entry : stack) {
            out += "  " + std::to_string(static_cast<int>(PAMControl::Control(entry.control()))) +
                   "{" + entry.control().text() + "} {" + entry.module() + "} ";
            Describe(entry.parameters(), out);
            out += "\n";
        }
    }
    return out;
}

inline std::string Describe(NSSConfiguration const& configuration) {
    std::string out;
    for (auto const& [database, services] : configuration.Databases()) {
        out += std::to_string(static_cast<int>(NSSDatabase::Database(database))) + ":\n";
        for (auto const& service : services) {
            out += "  {" + service.module() + "} ";
            Describe(service.parameters(), out);
            out += "\n";
        }
    }
    return out;
}

/// What differs between the two models, so that one set of properties serves both.
struct PAM {
    struct Model : PAMPolicy {
        Model() : PAMPolicy("system-auth-generic") {}
    };
    static constexpr char folder[] = "pam";
    static void Read(std::string_view text, Model& model) {
        ReadPolicy(text, model);
    }
    static void Print(Model const& model, std::string& out) {
        PrintPolicy(model, out);
    }
};

struct NSS {
    using Model = NSSConfiguration;
    static constexpr char folder[] = "nsswitch";
    static void Read(std::string_view text, Model& model) {
        ReadConfiguration(text, model);
    }
    static void Print(Model const& model, std::string& out) {
        PrintConfiguration(model, out);
    }
};

/// What came of reading a text: everything in the model, then the failure.
template <typename Kind> std::string FromText(std::string const& text) {
    typename Kind::Model model;
    auto const failure = Failure([&] { Kind::Read(text, model); });
    return Describe(model) + failure;
}

template <typename Kind> std::string FromStream(std::string const& text) {
    typename Kind::Model model;
    std::istringstream in(text);
    auto const failure = Failure([&] { in >> model; });
    return Describe(model) + failure;
}

/// The text that reading and printing makes of `text`, or the failure in its place.
template <typename Kind> std::string Normalised(std::string const& text) {
    std::string out;
    auto const failure = Failure([&] {
        typename Kind::Model model;
        Kind::Read(text, model);
        Kind::Print(model, out);
    });
    return failure.empty() ? out : failure;
}

template <typename Kind> std::string NormalisedThroughStreams(std::string const& text) {
    std::ostringstream out;
    auto const failure = Failure([&] {
        typename Kind::Model model;
        std::istringstream in(text);
        in >> model;
        out << model;
    });
    return failure.empty() ? out.str() : failure;
}

/// One text out of `words`, chosen and repeated at random but the same in each run.
inline std::string RandomText(std::mt19937& random, std::vector<std::string> const& words,
                              std::size_t length) {
    std::string text;
    for (std::size_t i = 0; i < length; ++i) {
        text += words[random() % words.size()];
    }
    return text;
}

} // namespace SystemFileModels

#endif
