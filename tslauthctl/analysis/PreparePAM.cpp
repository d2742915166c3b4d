// SPDX-License-Identifier: Apache-2.0
#include "analysis/Prepare.h"

#include <tslauth/Exceptions.h>
#include <tslauth/Paths.h>

#include <base/AsciiText.h>
#include <meaning/PAMMeaning.h>

#include <algorithm>
#include <set>

namespace tessel::tslauthctl {

namespace {

using namespace authentication;
using namespace base::AsciiText;
using namespace meaning;

constexpr int deepestInclude = 16;

/// Stand around a piece that is looked at on its own: every edited facility has an entry, and a
/// line that ends too early takes from the next one, which shows then.
constexpr char before[] = "auth\trequired\tbefore_it.so\naccount\trequired\tbefore_it.so\n";
constexpr char behind[] = "session\toptional\tbehind_it.so\n";

std::vector<std::string> RoundTripLosses(std::string const& text, ProviderEntries const& provider,
                                         HostFiles const& files) {
    auto const read = [&](std::string const& path) {
        auto found = path == Paths::PAMPolicy ? std::optional<std::string>(text) : files(path);
        if (!found) {
            throw IOError("Cannot open '" + path + "'");
        }
        return std::move(*found);
    };
    try {
        return ActivationPlan::Activating(provider, {}).PreviewOf(Paths::PAMPolicy, read).losses;
    } catch (std::exception const& e) {
        return {e.what()};
    }
}

/// Jumps are left out: where they land shows only in the whole file.
std::optional<std::string> Nothing(std::string const& /*path*/) {
    return std::string();
}

bool CarriesPiece(std::string const& piece, ProviderEntries const& provider) {
    auto const losses = RoundTripLosses(before + piece + "\n" + behind, provider, Nothing);
    return std::all_of(losses.begin(), losses.end(), [](std::string const& loss) {
        return loss.find(": the jump '") != std::string::npos;
    });
}

/// The facilities that a policy holds lines of, whatever it includes in turn.
/// @return false where that cannot be told, with the reason
bool FacilitiesOf(std::string const& policy, PAMPolicyReader const& reader, int depth,
                  std::set<std::string>& facilities, std::string& reason) {
    auto const text = depth < deepestInclude ? reader(policy) : std::nullopt;
    if (!text) {
        reason = "the policy '" + policy + "' cannot be read";
        return false;
    }
    auto const meaning = ReadPAMMeaning(*text);
    if (meaning.unreadable) {
        reason = "libpam refuses the policy '" + policy + "'";
        return false;
    }
    for (auto const& line : meaning.lines) {
        if (!line.known) {
            reason = "'" + line.facility + "' in the policy '" + policy +
                     "' fails another facility when it is included for each";
            return false;
        }
        if (line.facility != "@include") {
            facilities.insert(line.facility);
        } else if (!FacilitiesOf(line.module, reader, depth + 1, facilities, reason)) {
            return false;
        }
    }
    return true;
}

class PAMPreparation {
public:
    PAMPreparation(std::string_view text, ProviderEntries const& provider, HostFiles const& files,
                   bool acceptLoss)
        : _provider(provider), _files(files), _reader(PAMPoliciesIn(files)),
          _acceptLoss(acceptLoss), _lines(Lines(text)), _meaning(ReadPAMMeaning(text)) {
        auto const& entries = _meaning.lines;
        std::size_t number = 1;
        for (std::size_t i = 0; i < entries.size();) {
            for (; number < entries[i].first; ++number) {
                PrepareRest(number);
            }
            // A line that libpam reads in several pieces gives several entries.
            auto end = i + 1;
            auto last = entries[i].last;
            for (; end < entries.size() && entries[end].first <= last; ++end) {
                last = entries[end].last;
            }
            PreparePiece(number, last, i, end);
            number = last + 1;
            i = end;
        }
        if (_meaning.unreadable) {
            auto const what = "libpam refuses the whole file: its last line is continued, or too "
                              "long";
            for (auto rest = number; rest <= _lines.size(); ++rest) {
                _result.text += _lines[rest - 1];
            }
            _result.impossible.push_back({number, Raw(number), {}, what});
            return;
        }
        for (; number <= _lines.size(); ++number) {
            PrepareRest(number);
        }
        if (_result.impossible.empty()) {
            for (auto& loss : RoundTripLosses(_result.text, _provider, _files)) {
                _result.impossible.push_back({0, {}, {}, std::move(loss)});
            }
        }
    }

    Prepared Take() {
        return std::move(_result);
    }

private:
    /// A line without its line end.
    std::string Raw(std::size_t number) const {
        if (number > _lines.size()) {
            return {};
        }
        auto const line = _lines[number - 1];
        return std::string(line.substr(0, line.find('\n')));
    }

    /// A blank line or a comment.
    void PrepareRest(std::size_t number) {
        auto const line = _lines[number - 1];
        auto const start = std::find_if_not(line.begin(), line.end(), IsSpace);
        if (start == line.end() || *start == '#') {
            _result.text += line;
        } else {
            _result.edits.push_back({number,
                                     Raw(number),
                                     {},
                                     "libpam reads nothing from this line, and the library would "
                                     "refuse it"});
        }
    }

    /// The entries `i` to `end`, which stand in the lines `first` to `last`.
    void PreparePiece(std::size_t first, std::size_t last, std::size_t i, std::size_t end) {
        std::string raw;
        for (auto number = first; number <= last; ++number) {
            raw += _lines[number - 1];
        }
        if (CarriesPiece(raw, _provider)) {
            _result.text += raw;
            return;
        }
        std::string piece;
        std::string reason;
        for (; i < end; ++i) {
            std::string entry;
            if (!Rewritten(_meaning.lines[i], entry, reason)) {
                _result.impossible.push_back({first, Shown(first, last), {}, reason});
                if (!_acceptLoss || entry.empty()) {
                    _result.text += raw;
                    return;
                }
            }
            piece += entry;
        }
        auto after = piece;
        if (!after.empty()) {
            after.pop_back();
        }
        if (raw.back() != '\n') {
            piece = after;
        }
        _result.text += piece;
        _result.edits.push_back({first, Shown(first, last), after, reason});
    }

    std::string Shown(std::size_t first, std::size_t last) const {
        auto text = Raw(first);
        for (auto number = first + 1; number <= last; ++number) {
            text += "\n" + Raw(number);
        }
        return text;
    }

    /// The lines, each with its line feed, that say to the library what `line` says to libpam.
    /// @return false where there are none; `text` is then what comes nearest, or empty
    bool Rewritten(PAMLine const& line, std::string& text, std::string& reason) const {
        if (line.facility == "@include") {
            return RewrittenInclude(line, text, reason);
        }
        if (!line.known) {
            reason = "libpam does not know the facility '" + line.facility +
                     "', and fails every log-in for it";
            return false;
        }
        auto plain = line;
        plain.silent = false;
        text = PAMText(plain) + "\n";
        auto const read = ReadPAMMeaning(text);
        if (read.lines.size() == 1 && read.lines[0] == line && CarriesPiece(text, _provider)) {
            reason =
                line.silent ? "the library refuses the minus; without it libpam runs the same, "
                              "and logs it where the module is missing"
                : line.first != line.last ? "the library does not join continued lines"
                                          : "the library reads the line otherwise than libpam does";
            return true;
        }
        if (line.control.empty() || line.module.empty()) {
            reason = "libpam fails this entry, which lacks a control or a module, and the library "
                     "would take the next line for it";
            text.clear();
            return false;
        }
        reason = "the library keeps neither a run of blanks in an argument nor every control";
        std::string nearest;
        for (char const c : text) {
            bool const again = c == ' ' && !nearest.empty() && nearest.back() == ' ';
            nearest += again ? "" : std::string(1, c);
        }
        text = CarriesPiece(nearest, _provider) ? nearest : std::string();
        return false;
    }

    bool RewrittenInclude(PAMLine const& line, std::string& text, std::string& reason) const {
        std::set<std::string> facilities;
        if (!FacilitiesOf(line.module, _reader, 0, facilities, reason)) {
            return false;
        }
        reason = "the library refuses '@include'; the policy holds these facilities";
        for (auto const* facility : PAMFacilities) {
            if (facilities.count(facility) != 0) {
                text += std::string(facility) + "\tinclude\t" + line.module + "\n";
            }
        }
        if (facilities.empty()) {
            reason = "the library refuses '@include', and the policy holds nothing";
        }
        return true;
    }

    ProviderEntries const& _provider;
    HostFiles const& _files;
    PAMPolicyReader _reader;
    bool _acceptLoss;
    std::vector<std::string_view> _lines;
    PAMMeaning _meaning;
    Prepared _result;
};

} // namespace

Prepared PreparePAM(std::string_view text, ProviderEntries const& provider, HostFiles const& files,
                    bool acceptLoss) {
    return PAMPreparation(text, provider, files, acceptLoss).Take();
}

} // namespace tessel::tslauthctl
