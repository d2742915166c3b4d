// SPDX-License-Identifier: Apache-2.0
#include "NSSMeaning.h"

#include <base/AsciiText.h>

namespace tessel::meaning {

using namespace base::AsciiText;

namespace {

constexpr std::array<std::string_view, 4> statusNames = {"SUCCESS", "NOTFOUND", "UNAVAIL",
                                                         "TRYAGAIN"};
constexpr std::array<std::string_view, 3> actionNames = {"continue", "return", "merge"};
constexpr std::array<NSSAction, 3> allActions = {NSSAction::proceed, NSSAction::leave,
                                                 NSSAction::merge};

template <std::size_t size>
std::optional<std::size_t> Find(std::array<std::string_view, size> const& names,
                                std::string_view name) {
    for (std::size_t i = 0; i < size; ++i) {
        if (EqualsIgnoringCase(names[i], name)) {
            return i;
        }
    }
    return std::nullopt;
}

void SkipSpace(std::string_view& text) {
    while (!text.empty() && IsSpace(text.front())) {
        text.remove_prefix(1);
    }
}

/// Takes everything up to a blank or one of `ends`.
std::string_view TakeUntil(std::string_view& text, std::string_view ends) {
    std::size_t length = 0;
    while (length < text.size() && !IsSpace(text[length]) &&
           ends.find(text[length]) == std::string_view::npos) {
        ++length;
    }
    auto const word = text.substr(0, length);
    text.remove_prefix(length);
    return word;
}

/// Reads criteria from behind the "[" to behind the "]".
/// @return false where the C library gives up
bool TakeCriteria(std::string_view& text, NSSActions& actions) {
    SkipSpace(text);
    do {
        bool const allBut = !text.empty() && text.front() == '!';
        if (allBut) {
            text.remove_prefix(1);
        }
        auto const status = Find(statusNames, TakeUntil(text, "=]"));
        SkipSpace(text);
        if (!status || text.empty() || text.front() != '=') {
            return false;
        }
        text.remove_prefix(1);
        SkipSpace(text);
        auto const action = Find(actionNames, TakeUntil(text, "=]"));
        if (!action) {
            return false;
        }
        NSSAction const kept = actions[*status];
        if (allBut) {
            actions.fill(allActions[*action]);
            actions[*status] = kept;
        } else {
            actions[*status] = allActions[*action];
        }
        SkipSpace(text);
    } while (text.empty() || text.front() != ']');
    text.remove_prefix(1);
    return true;
}

} // namespace

std::optional<std::string> OneCriterion(NSSActions const& actions) {
    if (actions == DefaultNSSActions) {
        return std::string();
    }
    for (bool const allBut : {false, true}) {
        for (std::size_t status = 0; status < statusNames.size(); ++status) {
            for (std::size_t action = 0; action < actionNames.size(); ++action) {
                NSSActions given = DefaultNSSActions;
                if (allBut) {
                    given.fill(allActions[action]);
                    given[status] = DefaultNSSActions[status];
                } else {
                    given[status] = allActions[action];
                }
                if (given == actions) {
                    std::string text = allBut ? "[!" : "[";
                    text += statusNames[status];
                    text += '=';
                    text += actionNames[action];
                    return text + "]";
                }
            }
        }
    }
    return std::nullopt;
}

std::string NSSText(NSSServiceMeaning const& service) {
    if (auto const criterion = OneCriterion(service.actions)) {
        return criterion->empty() ? service.name : service.name + " " + *criterion;
    }
    std::string text = service.name + " [";
    bool first = true;
    for (std::size_t i = 0; i < statusNames.size(); ++i) {
        if (service.actions[i] != DefaultNSSActions[i]) {
            text += first ? "" : " ";
            first = false;
            text += statusNames[i];
            text += '=';
            text += actionNames[static_cast<std::size_t>(service.actions[i])];
        }
    }
    return text + "]";
}

std::string NSSText(NSSServices const& services) {
    std::string text;
    for (auto const& service : services) {
        text += text.empty() ? "" : " ";
        text += NSSText(service);
    }
    return text;
}

std::optional<NSSLine> ReadNSSLine(std::string_view line) {
    auto const* const start = line.data();
    auto const position = [&] { return static_cast<std::size_t>(line.data() - start); };
    line = line.substr(0, line.find('\n'));
    line = line.substr(0, line.find('\0'));
    SkipSpace(line);
    if (line.empty() || line.front() == '#') {
        return std::nullopt;
    }
    auto const database = TakeUntil(line, ":");
    if (database.empty() || line.empty()) {
        return std::nullopt;
    }
    NSSLine result;
    result.database = database;
    result.colon = line.front() == ':';
    line.remove_prefix(1);
    if (!result.colon) {
        // A lone colon is a service to the C library, one that can never be loaded; asking it
        // changes nothing.
        SkipSpace(line);
        if (!line.empty() && line.front() == ':' && (line.size() == 1 || IsSpace(line[1]))) {
            line.remove_prefix(1);
        }
    }
    while (true) {
        SkipSpace(line);
        auto const begin = position();
        auto const name = TakeUntil(line, "[");
        if (name.empty()) {
            result.unreadRest = !line.empty();
            return result;
        }
        NSSServiceMeaning service;
        service.name = name;
        service.begin = begin;
        service.end = position();
        SkipSpace(line);
        if (!line.empty() && line.front() == '[') {
            auto const bracket = line;
            line.remove_prefix(1);
            if (!TakeCriteria(line, service.actions)) {
                service.name += " ";
                service.name += bracket;
                service.end = bracket.size() + static_cast<std::size_t>(bracket.data() - start);
                result.faulty = true;
                result.services.push_back(std::move(service));
                return result;
            }
            service.end = position();
        }
        result.services.push_back(std::move(service));
    }
}

NSSServices ReadNSSServices(std::string_view list) {
    auto line = ReadNSSLine("any: " + std::string(list));
    return line ? std::move(line->services) : NSSServices();
}

NSSMeaning ReadNSSMeaning(std::string_view text) {
    NSSMeaning meaning;
    std::size_t number = 0;
    for (auto const raw : Lines(text)) {
        ++number;
        if (auto line = ReadNSSLine(raw)) {
            if (line->faulty) {
                meaning.faultyLines.push_back(number);
            }
            meaning.databases[line->database] = std::move(line->services);
        } else if (!IsBlank(raw)) {
            ++meaning.comments;
        }
    }
    return meaning;
}

std::optional<NSSServices> DefaultNSSServices(std::string const& database) {
    static constexpr std::string_view byFiles[] = {
        "passwd", "group", "shadow", "gshadow", "aliases", "ethers", "netgroup", "protocols",
        "services", "rpc",
        // Read by sudo and by the shadow tools, with the same default.
        "sudoers", "subid"};
    for (auto const name : byFiles) {
        if (database == name) {
            return NSSServices{{"files"}};
        }
    }
    if (database == "hosts" || database == "networks") {
        return NSSServices{{"files"}, {"dns"}};
    }
    return std::nullopt;
}

std::optional<NSSServices> EffectiveNSSServices(NSSMeaning const& meaning,
                                                std::string const& database) {
    auto const found = meaning.databases.find(database);
    return found != meaning.databases.end() ? found->second : DefaultNSSServices(database);
}

bool SameEffect(NSSServices left, NSSServices right) {
    for (auto* services : {&left, &right}) {
        if (!services->empty()) {
            auto& actions = services->back().actions;
            bool merges = false;
            for (auto const action : actions) {
                merges = merges || action == NSSAction::merge;
            }
            if (!merges) {
                actions = DefaultNSSActions;
            }
        }
    }
    return left == right;
}

} // namespace tessel::meaning
