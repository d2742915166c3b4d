// SPDX-License-Identifier: Apache-2.0
#include "ProviderModules.h"

#include "systemconfiguration/NSSConfigurationText.h"
#include "systemconfiguration/PAMPolicyText.h"
#include <tslauth/Paths.h>

#include <algorithm>
#include <sstream>
#include <string>

namespace tessel::authentication::ProviderModules {

using namespace SystemConfiguration;

namespace {

/// Room for what normalising and the edit add, so that the printed text is rarely moved.
std::size_t RoomFor(std::string_view text) {
    return text.size() + text.size() / 8 + 256;
}

template <typename Value> std::string Printed(Value const& value) {
    std::ostringstream text;
    text << value;
    return text.str();
}

template <typename Queue, typename Item> bool Contains(Queue const& queue, Item const& item) {
    return std::find(queue.begin(), queue.end(), item) != queue.end();
}

template <typename Queue, typename Item> void EraseFirst(Queue& queue, Item const& item) {
    auto const found = std::find(queue.begin(), queue.end(), item);
    if (found != queue.end()) {
        queue.erase(found);
    }
}

} // namespace

PAMEntry PAMEntryFor(std::string const& module, std::list<std::string> const& parameters) {
    PAMEntry entry(PAMControl::sufficient, Paths::PAMModulePrefix + module);
    entry.parameters() = parameters;
    return entry;
}

NSSService NSSServiceFor(std::string const& module, std::list<std::string> const& parameters) {
    NSSService service(module);
    service.parameters() = parameters;
    return service;
}

meaning::PAMLine Meaning(PAMEntry const& entry, std::string const& facility) {
    return meaning::ReadPAMEntry(facility, Printed(entry));
}

meaning::NSSServices Meaning(NSSService const& service) {
    return meaning::ReadNSSServices(Printed(service));
}

void Apply(Edit edit, PAMEntry const& entry, PAMPolicy& policy) {
    std::string const access = std::string(Paths::PAMModulePrefix) + Paths::PAMAccessModule;
    for (auto const facility : EditedFacilities) {
        switch (edit) {
        case Edit::insert: {
            auto& stack = policy[facility];
            if (!Contains(stack, entry)) {
                auto const found = stack.find(access);
                stack.insert(found == stack.end() ? stack.begin() : found + 1, entry);
            }
            break;
        }
        case Edit::remove:
            // Only where there is a stack: to look must not make one.
            if (policy.Stacks().count(facility) != 0) {
                EraseFirst(policy[facility], entry);
            }
            break;
        }
    }
}

void Apply(Edit edit, NSSService const& service, NSSConfiguration& configuration) {
    for (auto const database : EditedDatabases) {
        switch (edit) {
        case Edit::insert: {
            auto& services = configuration[database];
            if (!Contains(services, service)) {
                services.push_front(service);
            }
            break;
        }
        case Edit::remove:
            // Only where there is a queue: an empty one would say that no service answers.
            if (configuration.Databases().count(database) != 0) {
                EraseFirst(configuration[database], service);
            }
            break;
        }
    }
}

std::string EditedPAMPolicy(std::string_view text, Edit edit, PAMEntry const& entry) {
    PAMPolicy policy(Paths::PAMPolicyName);
    ReadPolicy(text, policy);
    Apply(edit, entry, policy);
    std::string out;
    out.reserve(RoomFor(text));
    PrintPolicy(policy, out);
    return out;
}

std::string EditedNSSConfiguration(std::string_view text, Edit edit, NSSService const& service) {
    NSSConfiguration configuration;
    ReadConfiguration(text, configuration);
    Apply(edit, service, configuration);
    std::string out;
    out.reserve(RoomFor(text));
    PrintConfiguration(configuration, out);
    return out;
}

} // namespace tessel::authentication::ProviderModules
