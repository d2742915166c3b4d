// SPDX-License-Identifier: Apache-2.0
#include "PAMMeaning.h"

#include <base/AsciiText.h>

#include <algorithm>

namespace tessel::meaning {

using namespace base::AsciiText;

namespace {

/// libpam's buffer for one line, its final NUL included.
constexpr std::size_t bufferSize = 1024;

/// The depth at which libpam gives up following includes.
constexpr int deepestInclude = 16;

/// Where libpam looks for a policy, in this order.
constexpr char const* policyFolders[] = {"/etc/pam.d/", "/usr/lib/pam.d/"};

constexpr std::string_view separators = " \n\t";

/// Stands at the head of a policy by custom. It is no comment that anybody would miss: the library
/// writes one of its own.
constexpr std::string_view policyHeader = "#%PAM-1.0";

/// A text as libpam gets it line by line: in pieces that its buffer holds.
class LineSource {
public:
    explicit LineSource(std::string_view text) : _rest(text) {}

    /// The next piece of at most `size` - 1 bytes, up to its line feed; false at the end.
    bool Next(std::size_t size, std::string_view& piece) {
        if (_rest.empty()) {
            return false;
        }
        if (_atLineStart) {
            ++_number;
        }
        auto const feed = _rest.find('\n');
        auto length = feed == std::string_view::npos ? _rest.size() : feed + 1;
        length = std::min(length, size - 1);
        piece = _rest.substr(0, length);
        _atLineStart = piece.back() == '\n';
        _rest.remove_prefix(length);
        piece = piece.substr(0, piece.find('\0'));
        return true;
    }

    /// The number of the line that the last piece was of.
    std::size_t Number() const {
        return _number;
    }

private:
    std::string_view _rest;
    std::size_t _number = 0;
    bool _atLineStart = true;
};

enum class Assembled { line, end, failure };

/// Puts together one line of a policy, without its comment and with its continuations.
Assembled AssembleLine(LineSource& source, std::string& line, std::size_t& first,
                       std::size_t& comments) {
    line.clear();
    bool used = false;
    while (true) {
        if (line.size() + 1 >= bufferSize) {
            return Assembled::failure;
        }
        std::string_view piece;
        if (!source.Next(bufferSize - line.size(), piece)) {
            return used ? Assembled::failure : Assembled::end;
        }
        auto const start = piece.find_first_not_of(separators);
        if (start == std::string_view::npos || piece[start] == '#') {
            bool const comment = start != std::string_view::npos &&
                                 piece.substr(start, policyHeader.size()) != policyHeader;
            comments += comment ? 1U : 0U;
            continue;
        }
        if (!used) {
            first = source.Number();
            used = true;
        }
        if (auto const comment = piece.find('#'); comment != std::string_view::npos) {
            ++comments;
            line += piece.substr(0, comment);
            return Assembled::line;
        }
        auto const end = piece.find_last_not_of(separators);
        if (piece[end] != '\\') {
            line += piece;
            return Assembled::line;
        }
        line += piece.substr(0, end);
        line += ' ';
    }
}

/// Takes one word. `bracketed` tells whether it stood in brackets, which are not part of it.
bool TakeWord(std::string_view& text, std::string& word, bool& bracketed) {
    word.clear();
    bracketed = false;
    auto const start = text.find_first_not_of(separators);
    if (start == std::string_view::npos) {
        text = {};
        return false;
    }
    text.remove_prefix(start);
    if (text.front() == '[') {
        bracketed = true;
        std::size_t i = 1;
        for (; i < text.size() && text[i] != ']'; ++i) {
            if (text[i] == '\\' && i + 1 < text.size() && text[i + 1] == ']') {
                ++i;
            }
            word += text[i];
        }
        text.remove_prefix(std::min(i + 1, text.size()));
        return true;
    }
    auto const length = std::min(text.find_first_of(separators), text.size());
    word = text.substr(0, length);
    // The separator goes with the word, as in libpam.
    text.remove_prefix(std::min(length + 1, text.size()));
    return true;
}

/// The criteria of a bracketed control with single blanks between them and none elsewhere.
std::string NormalisedCriteria(std::string_view text) {
    std::string out;
    bool blank = false;
    for (char const c : text) {
        if (IsSpace(c)) {
            blank = true;
            continue;
        }
        if (blank && !out.empty() && c != '=' && out.back() != '=') {
            out += ' ';
        }
        blank = false;
        out += c;
    }
    return out;
}

std::string Bracketed(std::string_view text) {
    std::string out = "[";
    for (char const c : text) {
        if (c == ']') {
            out += '\\';
        }
        out += c;
    }
    return out + "]";
}

bool IsFacility(std::string const& word) {
    return std::any_of(std::begin(PAMFacilities), std::end(PAMFacilities),
                       [&](char const* facility) { return word == facility; });
}

PAMLine ParseLine(std::string_view text) {
    PAMLine line;
    std::string word;
    bool bracketed = false;
    if (TakeWord(text, word, bracketed)) {
        if (!bracketed && word.front() == '-') {
            line.silent = true;
            word.erase(0, 1);
        }
        auto const lower = Lower(word);
        line.known = IsFacility(lower) || lower == "@include";
        line.facility = line.known ? lower : word;
    }
    if (line.facility == "@include") {
        TakeWord(text, line.module, bracketed);
        return line;
    }
    if (TakeWord(text, word, bracketed)) {
        if (bracketed) {
            line.control = Bracketed(NormalisedCriteria(word));
        } else {
            static constexpr std::string_view controls[] = {"required", "requisite", "sufficient",
                                                            "optional", "include",   "substack"};
            auto const lower = Lower(word);
            bool const known =
                std::find(std::begin(controls), std::end(controls), lower) != std::end(controls);
            line.control = known ? lower : word;
        }
    }
    TakeWord(text, line.module, bracketed);
    while (TakeWord(text, word, bracketed)) {
        line.arguments.push_back(word);
    }
    return line;
}

/// An argument as it has to be written to be read as `argument`.
std::string ArgumentText(std::string const& argument) {
    bool const plain = !argument.empty() && argument.front() != '[' &&
                       argument.find_first_of(separators) == std::string::npos;
    return plain ? argument : Bracketed(argument);
}

struct Jump {
    std::string criterion;
    std::size_t count;
};

std::vector<Jump> JumpsOf(std::string const& control) {
    std::vector<Jump> jumps;
    if (control.empty() || control.front() != '[') {
        return jumps;
    }
    std::string_view rest(control);
    rest = rest.substr(1, rest.size() - 2);
    while (!rest.empty()) {
        auto const length = std::min(rest.find(' '), rest.size());
        auto const pair = rest.substr(0, length);
        rest.remove_prefix(std::min(length + 1, rest.size()));
        auto const equals = pair.find('=');
        if (equals == std::string_view::npos || equals + 1 == pair.size()) {
            continue;
        }
        std::size_t count = 0;
        bool number = true;
        for (char const c : pair.substr(equals + 1)) {
            number = number && c >= '0' && c <= '9' && count < 100000;
            count = number ? count * 10 + static_cast<std::size_t>(c - '0') : count;
        }
        if (number && count > 0) {
            jumps.push_back({std::string(pair), count});
        }
    }
    return jumps;
}

/// One module that libpam runs at the level of the stack itself.
struct Step {
    /// The line of the stack that brings it, and its place among what that line brings.
    std::size_t line;
    std::size_t within;
    std::string control;
    /// An include that cannot be read stands here; how many modules it brings is not known.
    bool unknown;
};

void Flatten(std::vector<PAMLine> const& stack, PAMPolicyReader const& reader, int depth,
             std::optional<std::size_t> origin, std::vector<Step>& steps) {
    for (std::size_t i = 0; i < stack.size(); ++i) {
        auto const& line = stack[i];
        auto const top = origin.value_or(i);
        auto const text = line.IsInclude() && depth < deepestInclude ? reader(line.module)
                                                                     : std::optional<std::string>();
        if (text) {
            Flatten(PAMStackOf(ReadPAMMeaning(*text), line.facility), reader, depth + 1, top,
                    steps);
            continue;
        }
        bool const same = !steps.empty() && steps.back().line == top;
        steps.push_back({top, same ? steps.back().within + 1 : 0, line.control, line.IsInclude()});
    }
}

} // namespace

std::string PAMText(PAMLine const& line) {
    std::string text = (line.silent ? "-" : "") + line.facility;
    for (auto const* field : {&line.control, &line.module}) {
        if (!field->empty()) {
            text += "\t" + *field;
        }
    }
    char separator = '\t';
    for (auto const& argument : line.arguments) {
        text += separator + ArgumentText(argument);
        separator = ' ';
    }
    return text;
}

PAMLine ReadPAMEntry(std::string const& facility, std::string const& entry) {
    auto meaning = ReadPAMMeaning(facility + "\t" + entry + "\n");
    return meaning.lines.empty() ? PAMLine() : std::move(meaning.lines.front());
}

PAMMeaning ReadPAMMeaning(std::string_view text) {
    PAMMeaning meaning;
    LineSource source(text);
    std::string assembled;
    while (true) {
        std::size_t first = 0;
        switch (AssembleLine(source, assembled, first, meaning.comments)) {
        case Assembled::failure:
            meaning.unreadable = true;
            return meaning;
        case Assembled::end:
            return meaning;
        case Assembled::line:
            meaning.lines.push_back(ParseLine(assembled));
            meaning.lines.back().first = first;
            meaning.lines.back().last = source.Number();
            break;
        }
    }
}

std::vector<PAMLine> PAMStackOf(PAMMeaning const& meaning, std::string const& facility) {
    std::vector<PAMLine> stack;
    for (auto const& line : meaning.lines) {
        bool const everywhere = line.facility == "@include" || !line.known;
        if (line.facility == facility || everywhere) {
            stack.push_back(line);
            if (line.facility == "@include") {
                stack.back().facility = facility;
                stack.back().control = "include";
            }
        }
    }
    return stack;
}

PAMPolicyReader PAMPoliciesIn(std::function<std::optional<std::string>(std::string const&)> file) {
    return [file = std::move(file)](std::string const& name) -> std::optional<std::string> {
        if (!name.empty() && name.front() == '/') {
            return file(name);
        }
        for (auto const* const folder : policyFolders) {
            if (auto text = file(folder + name)) {
                return text;
            }
        }
        return std::nullopt;
    };
}

bool RunsAnything(std::vector<PAMLine> const& stack, PAMPolicyReader const& reader) {
    std::vector<Step> steps;
    Flatten(stack, reader, 0, std::nullopt, steps);
    return !steps.empty();
}

std::vector<PAMJump> PAMJumps(std::vector<PAMLine> const& stack, PAMPolicyReader const& reader) {
    std::vector<Step> steps;
    Flatten(stack, reader, 0, std::nullopt, steps);
    std::vector<PAMJump> jumps;
    for (std::size_t i = 0; i < steps.size(); ++i) {
        for (auto& jump : JumpsOf(steps[i].control)) {
            PAMJump result{steps[i].line, std::move(jump.criterion), stack.size(), 0};
            auto const last = std::min(steps.size(), i + 1 + jump.count);
            bool const known = std::none_of(steps.begin() + static_cast<std::ptrdiff_t>(i) + 1,
                                            steps.begin() + static_cast<std::ptrdiff_t>(last),
                                            [](Step const& step) { return step.unknown; });
            if (!known) {
                result.to.reset();
            } else if (last < steps.size()) {
                result.to = steps[last].line;
                result.within = steps[last].within;
            }
            jumps.push_back(std::move(result));
        }
    }
    return jumps;
}

} // namespace tessel::meaning
