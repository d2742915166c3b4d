// SPDX-License-Identifier: Apache-2.0
#include "analysis/Agreement.h"

#include <meaning/NSSMeaning.h>
#include <meaning/PAMMeaning.h>

#include <algorithm>
#include <sstream>

namespace tessel::tslauthctl {

namespace {

using namespace authentication;
using namespace meaning;

template <typename Value> std::string Printed(Value const& value) {
    std::ostringstream text;
    text << value;
    return text.str();
}

std::vector<Part> UnknownParts(std::vector<std::string> const& names) {
    std::vector<Part> parts;
    parts.reserve(names.size());
    for (auto const& name : names) {
        parts.push_back({name, Agreement::unknown});
    }
    return parts;
}

Part MakePart(std::string const& name, bool present, bool wanted) {
    return {name, present == wanted ? Agreement::inStep : Agreement::notAtAll};
}

} // namespace

char const* Word(Agreement agreement) {
    switch (agreement) {
    case Agreement::inStep:
        return "in-step";
    case Agreement::partly:
        return "partly";
    case Agreement::notAtAll:
        return "not-at-all";
    case Agreement::unknown:
        break;
    }
    return "unknown";
}

std::vector<Part> PAMParts(std::string_view text, SystemConfiguration::PAMEntry const& entry,
                           bool wanted) {
    auto const meaning = ReadPAMMeaning(text);
    std::vector<Part> parts;
    for (auto const& facility : EditedFacilities()) {
        auto const stack = PAMStackOf(meaning, facility);
        auto const sought = ReadPAMEntry(facility, Printed(entry));
        bool const present = std::find(stack.begin(), stack.end(), sought) != stack.end();
        parts.push_back(MakePart(facility, present, wanted));
    }
    return parts;
}

std::vector<Part> NSSParts(std::string_view text, SystemConfiguration::NSSService const& service,
                           bool wanted) {
    auto const meaning = ReadNSSMeaning(text);
    auto const sought = ReadNSSServices(Printed(service));
    std::vector<Part> parts;
    for (auto const& database : EditedDatabases()) {
        auto const services = EffectiveNSSServices(meaning, database).value_or(NSSServices());
        bool const present =
            !sought.empty() && std::search(services.begin(), services.end(), sought.begin(),
                                           sought.end()) != services.end();
        parts.push_back(MakePart(database, present, wanted));
    }
    return parts;
}

std::vector<Part> UnknownPAMParts() {
    return UnknownParts(EditedFacilities());
}

std::vector<Part> UnknownNSSParts() {
    return UnknownParts(EditedDatabases());
}

Agreement Together(std::vector<Part> const& parts) {
    auto const count = [&](Agreement agreement) {
        return static_cast<std::size_t>(
            std::count_if(parts.begin(), parts.end(),
                          [&](Part const& part) { return part.agreement == agreement; }));
    };
    if (count(Agreement::unknown) > 0) {
        return Agreement::unknown;
    }
    if (count(Agreement::inStep) == parts.size()) {
        return Agreement::inStep;
    }
    return count(Agreement::notAtAll) == parts.size() ? Agreement::notAtAll : Agreement::partly;
}

} // namespace tessel::tslauthctl
