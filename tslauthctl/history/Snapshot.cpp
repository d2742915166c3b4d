// SPDX-License-Identifier: Apache-2.0
#include "history/Snapshot.h"

#include <algorithm>
#include <iterator>
#include <stdexcept>

namespace tessel::tslauthctl {

namespace {

using Kind = PathState::Kind;

constexpr std::pair<Kind, char const*> kinds[] = {{Kind::absent, "absent"},
                                                  {Kind::file, "file"},
                                                  {Kind::link, "link"},
                                                  {Kind::folder, "folder"},
                                                  {Kind::other, "other"}};

char const* Word(Kind kind) {
    return std::find_if(std::begin(kinds), std::end(kinds),
                        [&](auto const& each) { return each.first == kind; })
        ->second;
}

Kind KindOf(std::string const& word) {
    auto const* const found = std::find_if(std::begin(kinds), std::end(kinds),
                                           [&](auto const& each) { return each.second == word; });
    if (found == std::end(kinds)) {
        throw std::invalid_argument("'" + word + "' is nothing that can be at a path");
    }
    return found->first;
}

constexpr char digits[] = "0123456789abcdef";

/// Attributes are bytes, and documents have none.
std::string Hexadecimal(std::string const& bytes) {
    std::string text;
    for (char const c : bytes) {
        auto const byte = static_cast<unsigned char>(c);
        text += digits[byte >> 4U];
        text += digits[byte & 0xfU];
    }
    return text;
}

unsigned Digit(char c) {
    auto const* const found = std::find(digits, digits + 16, c);
    if (found == digits + 16) {
        throw std::invalid_argument("an attribute is not written in hexadecimal digits");
    }
    return static_cast<unsigned>(found - digits);
}

std::string BytesOf(std::string const& text) {
    std::string bytes;
    for (std::size_t i = 0; i + 1 < text.size(); i += 2) {
        bytes += static_cast<char>(Digit(text[i]) << 4U | Digit(text[i + 1]));
    }
    return bytes;
}

nlohmann::json Described(PathState const& state) {
    nlohmann::json described = {{"kind", Word(state.kind)}};
    if (state.kind == Kind::absent || state.kind == Kind::other) {
        return described;
    }
    described["mode"] = state.attributes.mode;
    described["owner"] = state.attributes.owner;
    described["group"] = state.attributes.group;
    if (state.kind == Kind::link) {
        described["target"] = state.text;
    }
    for (auto const& [name, value] : state.attributes.extended) {
        described["attributes"][name] = Hexadecimal(value);
    }
    return described;
}

PathState StateIn(nlohmann::json const& document) {
    PathState state;
    state.kind = KindOf(document.at("kind").get<std::string>());
    if (state.kind == Kind::absent || state.kind == Kind::other) {
        return state;
    }
    state.attributes.mode = document.at("mode").get<mode_t>();
    state.attributes.owner = document.at("owner").get<uid_t>();
    state.attributes.group = document.at("group").get<gid_t>();
    if (state.kind == Kind::link) {
        state.text = document.at("target").get<std::string>();
    }
    if (auto const extended = document.find("attributes"); extended != document.end()) {
        for (auto const& [name, value] : extended->items()) {
            state.attributes.extended[name] = BytesOf(value.get<std::string>());
        }
    }
    return state;
}

} // namespace

std::vector<std::string> Snapshot::Changed() const {
    std::vector<std::string> changed;
    if (after) {
        for (auto const& [path, state] : Differing(before, *after)) {
            changed.push_back(path);
        }
    }
    return changed;
}

nlohmann::json Described(PathStates const& states) {
    auto described = nlohmann::json::object();
    for (auto const& [path, state] : states) {
        described[path] = Described(state);
    }
    return described;
}

nlohmann::json Described(Snapshot const& snapshot) {
    return {{"number", snapshot.number},
            {"when", snapshot.when},
            {"verb", snapshot.verb},
            {"command", snapshot.command},
            {"uid", snapshot.caller.uid},
            {"login_uid", snapshot.caller.loginUid},
            {"sudo_user", snapshot.caller.sudoUser},
            {"before", Described(snapshot.before)}};
}

PathStates StatesIn(nlohmann::json const& document) {
    PathStates states;
    for (auto const& [path, state] : document.items()) {
        states[path] = StateIn(state);
    }
    return states;
}

Snapshot SnapshotIn(nlohmann::json const& document) {
    Snapshot snapshot;
    snapshot.number = document.at("number").get<unsigned>();
    snapshot.when = document.at("when").get<std::string>();
    snapshot.verb = document.at("verb").get<std::string>();
    snapshot.command = document.at("command").get<std::string>();
    snapshot.caller = {document.at("uid").get<unsigned>(),
                       document.at("login_uid").get<std::string>(),
                       document.at("sudo_user").get<std::string>()};
    snapshot.before = StatesIn(document.at("before"));
    return snapshot;
}

PathStates Differing(PathStates const& before, PathStates const& states) {
    PathStates differing;
    for (auto const& [path, state] : states) {
        auto const found = before.find(path);
        if (found == before.end() || found->second != state) {
            differing.emplace(path, state);
        }
    }
    return differing;
}

} // namespace tessel::tslauthctl
