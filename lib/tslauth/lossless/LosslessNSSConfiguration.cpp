// SPDX-License-Identifier: Apache-2.0
#include "LosslessNSSConfiguration.h"

#include "WholeLines.h"
#include "systemconfiguration/NSSConfigurationText.h"
#include "systemconfiguration/Words.h"

#include <base/AsciiText.h>
#include <meaning/NSSMeaning.h>
#include <tslauth/Exceptions.h>

#include <algorithm>
#include <cstddef>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

namespace tessel::authentication::ProviderModules {

using namespace SystemConfiguration;
using meaning::NSSLine;
using meaning::NSSServices;

namespace {

/// A line for a database, as the C library reads it.
struct Line {
    std::size_t begin;
    std::string_view text;
    NSSLine meaning;
};

std::vector<Line> LinesFor(std::string_view database, std::string_view text) {
    std::vector<Line> lines;
    auto const* const start = text.data();
    while (!text.empty()) {
        auto const line = base::AsciiText::TakeLine(text);
        auto meaning = meaning::ReadNSSLine(line);
        if (meaning && meaning->database == database) {
            lines.push_back(
                {static_cast<std::size_t>(line.data() - start), line, std::move(*meaning)});
        }
    }
    return lines;
}

/// The model's services of `database`; nothing where the model cannot read `text`.
std::optional<std::deque<NSSService>> ModelServices(std::string_view text,
                                                    NSSDatabase::Database database) {
    NSSConfiguration configuration;
    try {
        ReadConfiguration(text, configuration);
    } catch (InvalidDatabaseException const&) {
        return std::nullopt;
    } catch (std::out_of_range const&) {
        return std::nullopt;
    }
    return configuration[database];
}

std::vector<std::size_t> IndicesOf(NSSService const& service,
                                   std::deque<NSSService> const& services) {
    std::vector<std::size_t> indices;
    for (std::size_t i = 0; i < services.size(); ++i) {
        if (services[i] == service) {
            indices.push_back(i);
        }
    }
    return indices;
}

NSSServices::const_iterator Find(NSSService const& service, NSSServices const& services) {
    auto const sought = Meaning(service);
    return sought.empty()
               ? services.end()
               : std::search(services.begin(), services.end(), sought.begin(), sought.end());
}

bool Holds(Line const& line, NSSDatabase::Database database, NSSService const& service) {
    if (auto const services = ModelServices(line.text, database)) {
        return !IndicesOf(service, *services).empty();
    }
    return Find(service, line.meaning.services) != line.meaning.services.end();
}

std::string TextOf(NSSService const& service) {
    std::string text;
    PrintService(service, text);
    return text;
}

/// A line for a database that has none, below the comment by which both are known again.
std::string AddedLines(std::string const& database) {
    auto const services =
        meaning::NSSText(meaning::DefaultNSSServices(database).value_or(NSSServices()));
    return "# Added by tslauth: without a line, '" + database + "' is looked up in '" + services +
           "'.\n" + database + ": " + services + "\n";
}

/// The start of the first line that is neither blank nor a comment; the end where there is none.
std::size_t FirstLine(std::string_view text) {
    auto const size = text.size();
    while (!text.empty()) {
        auto const left = text.size();
        auto const line = base::AsciiText::Trimmed(base::AsciiText::TakeLine(text));
        if (!line.empty() && line.front() != '#') {
            return size - left;
        }
    }
    return size;
}

/// Behind all that the C library reads of a line.
std::size_t EndOfContent(std::string_view line) {
    line = line.substr(0, line.find('\n'));
    line = line.substr(0, line.find('\0'));
    return line.size() - (!line.empty() && line.back() == '\r' ? 1 : 0);
}

/// The lines that `text` lacks, without the provider's service.
std::string WithMissingLines(std::string_view text) {
    std::string missing;
    for (auto const database : EditedDatabases) {
        std::string const word(Words::WordOf<NSSDatabase>(database));
        if (LinesFor(word, text).empty()) {
            missing += AddedLines(word);
        }
    }
    return missing.empty() ? std::string(text) : WithLines(text, FirstLine(text), missing);
}

/// @param text has a line for `database`
std::string WithService(std::string const& text, NSSDatabase::Database database,
                        NSSService const& service) {
    std::string const word(Words::WordOf<NSSDatabase>(database));
    auto const lines = LinesFor(word, text);
    // Of several lines the C library uses the last.
    auto const& line = lines.back();
    if (Holds(line, database, service)) {
        return text;
    }
    auto const& services = line.meaning.services;
    auto edited = text;
    return services.empty()
               ? edited.insert(line.begin + EndOfContent(line.text), " " + TextOf(service))
               : edited.insert(line.begin + services.front().begin, TextOf(service) + " ");
}

/// Takes one service out of a line, with the blank that an insertion brings.
bool TakeOut(NSSService const& service, Line const& line, std::string& text) {
    auto const& services = line.meaning.services;
    auto const first = Find(service, services);
    if (first == services.end()) {
        return false;
    }
    auto const last = first + static_cast<std::ptrdiff_t>(Meaning(service).size()) - 1;
    auto begin = first->begin;
    auto end = last->end;
    auto const isBlank = [&](std::size_t at) {
        return line.text[at] == ' ' || line.text[at] == '\t';
    };
    if (last + 1 != services.end()) {
        end += isBlank(end) ? 1U : 0U;
    } else {
        begin -= isBlank(begin - 1) ? 1U : 0U;
    }
    text.erase(line.begin + begin, end - begin);
    return true;
}

/// Takes out what `WithMissingLines` has added for a database and nobody has changed since.
/// @param begin where the line for the database begins
void TakeOutIfAdded(std::string const& database, std::size_t begin, std::string& text) {
    auto const added = AddedLines(database);
    auto const comment = added.find('\n') + 1;
    if (begin < comment) {
        return;
    }
    auto const start = begin - comment;
    // At the end of a text there may be no line feed.
    auto const size = std::min(added.size(), text.size() - start);
    bool const same = size + 1 >= added.size() && text.compare(start, size, added, 0, size) == 0;
    if (same && LineStart(text, start) == start) {
        text = WithoutLines(text, start, start + size);
    }
}

std::string WithoutService(std::string text, NSSDatabase::Database database,
                           NSSService const& service) {
    std::string const word(Words::WordOf<NSSDatabase>(database));
    bool found = true;
    while (found) {
        found = false;
        for (auto const& line : LinesFor(word, text)) {
            if (TakeOut(service, line, text)) {
                TakeOutIfAdded(word, line.begin, text);
                found = true;
                break; // the other lines have moved
            }
        }
    }
    return text;
}

/// Whether both readers find in `after` the service that was to be inserted into `before`.
bool BothFind(std::string_view before, std::string_view after, NSSDatabase::Database database,
              NSSService const& service) {
    auto const lines = LinesFor(Words::WordOf<NSSDatabase>(database), after);
    if (lines.empty() ||
        Find(service, lines.back().meaning.services) == lines.back().meaning.services.end()) {
        return false;
    }
    auto const made = ModelServices(after, database);
    if (!made) {
        return true;
    }
    auto const was = ModelServices(before, database);
    auto expected = was ? IndicesOf(service, *was) : std::vector<std::size_t>();
    if (expected.empty()) {
        expected = {0};
    }
    return IndicesOf(service, *made) == expected;
}

} // namespace

std::string LosslessNSSConfiguration(std::string_view text, Edit edit, NSSService const& service) {
    std::string edited(text);
    switch (edit) {
    case Edit::insert:
        RefuseNul(text);
        edited = WithMissingLines(text);
        for (auto const database : EditedDatabases) {
            edited = WithService(edited, database, service);
        }
        for (auto const database : EditedDatabases) {
            if (!BothFind(text, edited, database, service)) {
                throw ConfigurationError("The service '" + service.module() +
                                         "' has no place in '" +
                                         std::string(Words::WordOf<NSSDatabase>(database)) +
                                         "' where all readers of the file find it");
            }
        }
        break;
    case Edit::remove:
        for (auto const database : EditedDatabases) {
            edited = WithoutService(edited, database, service);
        }
        break;
    }
    return edited;
}

} // namespace tessel::authentication::ProviderModules
