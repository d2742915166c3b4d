// SPDX-License-Identifier: Apache-2.0
#include "text/SambaInclude.h"

#include "text/SambaLines.h"

#include <algorithm>
#include <base/AsciiText.h>
#include <cstddef>
#include <optional>
#include <vector>

using namespace tessel::base::AsciiText;

namespace tessel::winbind {

namespace {

constexpr std::string_view Comment =
    "# Written by tslauth: the domain that this host is joined to. It stays the last of [global].";

/// In place of `Comment` where empty lines had to end a continued one first; with their number in
/// between.
constexpr std::string_view CommentBelowEmptyLines =
    "# Written by tslauth, with empty lines above (";
constexpr std::string_view CommentBelowEmptyLinesEnd = "): the domain that this host is joined to.";

constexpr std::string_view Header = "[global]";

bool Includes(SambaLine const& line, std::string_view path) {
    return line.global && line.kind == SambaLine::Kind::parameter && line.name == "include" &&
           line.value == path;
}

/// Behind the last line that says anything in the last [global] section; nothing where no line is
/// in any.
SambaLine const* LastGlobal(std::vector<SambaLine> const& lines) {
    auto const last = std::find_if(lines.rbegin(), lines.rend(), [](SambaLine const& line) {
        return line.global &&
               (line.kind == SambaLine::Kind::section || line.kind == SambaLine::Kind::parameter);
    });
    return last == lines.rend() ? nullptr : &*last;
}

/// How many empty lines a comment of ours says to stand above it; nothing where it is not ours.
std::optional<std::size_t> AddedEmptyLines(std::string_view comment) {
    if (comment == Comment) {
        return 0;
    }
    if (!StartsWith(comment, CommentBelowEmptyLines) ||
        !EndsWith(comment, CommentBelowEmptyLinesEnd)) {
        return std::nullopt;
    }
    comment.remove_prefix(CommentBelowEmptyLines.size());
    auto const lines = SambaNumber(comment.substr(0, comment.find(')')));
    return lines ? std::optional(static_cast<std::size_t>(*lines)) : std::nullopt;
}

/// Where what WithSambaInclude() added with the line `include` begins.
std::size_t BeginOfAdded(std::string_view text, std::vector<SambaLine> const& lines,
                         std::size_t include) {
    auto const content = [&](std::size_t back) {
        return include < back ? std::string_view() : lines[include - back].content;
    };
    if (auto const emptyLines = AddedEmptyLines(content(1))) {
        SambaLine const& comment = lines[include - 1];
        std::string_view const lineEnd = LineEnd(text.substr(0, comment.end).substr(comment.begin));
        // Those of the empty lines, and the one that a text without its last one was given.
        std::size_t added = *emptyLines + (text[lines[include].end - 1] == '\n' ? 0 : 1);
        std::size_t begin = comment.begin;
        for (; added > 0 && EndsWith(text.substr(0, begin), lineEnd); --added) {
            begin -= lineEnd.size();
        }
        return begin;
    }
    if (content(2) == Comment && lines[include - 1].kind == SambaLine::Kind::section) {
        SambaLine const& header = lines[include - 1];
        if (TrimmedRight(text.substr(0, header.end).substr(header.begin)) == Header) {
            return lines[include - 2].begin;
        }
    }
    return lines[include].begin;
}

} // namespace

bool HasSambaInclude(std::string_view text, std::string_view path) {
    auto const lines = SambaLines(text);
    return std::any_of(lines.begin(), lines.end(),
                       [path](SambaLine const& line) { return Includes(line, path); });
}

std::string WithSambaInclude(std::string_view text, std::string_view path) {
    auto const lines = SambaLines(text);
    std::string result(text);
    if (std::any_of(lines.begin(), lines.end(),
                    [path](SambaLine const& line) { return Includes(line, path); })) {
        return result;
    }
    std::string const lineEnd(LineEnd(text));
    std::string const include = "\tinclude = " + std::string(path);
    SambaLine const* const last = LastGlobal(lines);
    if (last == nullptr) {
        // At the top: what follows [global] in the same file may be a share's.
        result.insert(0, std::string(Comment) + lineEnd + std::string(Header) + lineEnd + include +
                             lineEnd);
        return result;
    }
    bool const complete = text[last->end - 1] == '\n';
    std::string addition = complete ? "" : lineEnd;
    for (std::size_t i = 0; i < last->openAtEnd; ++i) {
        addition += lineEnd;
    }
    if (last->openAtEnd == 0) {
        addition += Comment;
    } else {
        addition += CommentBelowEmptyLines;
        addition += std::to_string(last->openAtEnd);
        addition += CommentBelowEmptyLinesEnd;
    }
    // Without a last line end where there was none, which is how WithoutSambaInclude() knows.
    addition += lineEnd + include + (complete ? lineEnd : "");
    result.insert(last->end, addition);
    return result;
}

std::string WithoutSambaInclude(std::string_view text, std::string_view path) {
    auto const lines = SambaLines(text);
    std::string result;
    std::size_t kept = 0;
    for (std::size_t i = 0; i < lines.size(); ++i) {
        if (Includes(lines[i], path)) {
            auto const begin = std::max(kept, BeginOfAdded(text, lines, i));
            result += text.substr(kept, begin - kept);
            kept = lines[i].end;
        }
    }
    return result += text.substr(kept);
}

} // namespace tessel::winbind
