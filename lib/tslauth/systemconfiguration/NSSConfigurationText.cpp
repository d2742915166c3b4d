// SPDX-License-Identifier: Apache-2.0
#include "NSSConfigurationText.h"

#include "Input.h"
#include "Words.h"

#include <cstddef>
#include <deque>
#include <list>
#include <stdexcept>
#include <string>
#include <string_view>

namespace SystemConfiguration {

namespace {

/// Appends the words between the bracket at `open` and the one at `close`.
void ReadParameters(std::string_view line, std::size_t open, std::size_t close,
                    std::list<std::string>& parameters) {
    TextInput in(line.substr(open + 1, close - open - 1));
    for (auto word = in.Word(); !word.empty(); word = in.Word()) {
        parameters.emplace_back(word.data(), word.size());
    }
}

} // namespace

std::deque<NSSService>& NSSLineReader::ServicesOf(NSSDatabase::Database database) {
    std::deque<NSSService>*& services = _services[database];
    if (services == nullptr) {
        services = &_configuration[database];
    }
    return *services;
}

void NSSLineReader::Read(std::string_view line) {
    if (line.empty() || line.front() == '#') {
        return;
    }
    auto const start = line.find_first_not_of(" \t\r\n");
    if (start == std::string_view::npos) {
        return;
    }
    line.remove_prefix(start);

    TextInput in(line);
    auto word = in.Word();
    // Whatever the last character is: the separator is not checked.
    word.remove_suffix(word.empty() ? 0 : 1);
    auto const database = Words::ValueOf<NSSDatabase>(word);

    // The first "]" at or after the position looked at. Positions only grow, so that it is searched
    // for again only when passed, and a long line costs no more a word than a short one.
    std::size_t close = 0;
    for (word = in.Word(); !word.empty(); word = in.Word()) {
        std::size_t const position = in.Position();
        bool parameters = false;
        std::size_t const open = position + 1;
        if (position < line.size()) {
            if (open == line.size()) {
                // Deliberate, and the text too: a caller learns that the line ends in one stray
                // character, as it always has.
                throw std::out_of_range("basic_string::at");
            }
            if (close != std::string_view::npos && close < open) {
                close = line.find(']', open);
            }
            if (close != std::string_view::npos) {
                parameters = line[open] == '[';
                // Deliberate: the distance is counted from the line's start and not from the word,
                // so that what follows a list on the same line is passed over or cut. Tools that
                // warn of the loss rely on exactly this.
                in.MoveTo(close + open < line.size() ? close + open : line.size());
            }
        }
        NSSService& service = ServicesOf(database).emplace_back(word.data(), word.size());
        if (parameters) {
            ReadParameters(line, open, close, service.parameters());
        }
    }
}

void ReadConfiguration(std::string_view text, NSSConfiguration& configuration) {
    NSSLineReader reader(configuration);
    TextInput in(text);
    while (!in.AtEnd()) {
        reader.Read(in.Line());
    }
}

void PrintService(NSSService const& service, std::string& out) {
    out += service.module();
    if (service.parameters().empty()) {
        return;
    }
    char const* before = " [";
    for (auto const& parameter : service.parameters()) {
        out += before;
        out += parameter;
        before = " ";
    }
    out += ']';
}

void PrintConfiguration(NSSConfiguration const& configuration, std::string& out) {
    for (auto const& [database, services] : configuration.Databases()) {
        out += Words::WordOf<NSSDatabase>(database);
        out += ':';
        for (auto const& service : services) {
            out += ' ';
            PrintService(service, out);
        }
        out += '\n';
    }
}

} // namespace SystemConfiguration
