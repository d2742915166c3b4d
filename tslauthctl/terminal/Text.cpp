// SPDX-License-Identifier: Apache-2.0
#include "terminal/Text.h"

namespace tessel::tslauthctl {

namespace {

void AppendHex(std::string& out, unsigned char c) {
    static constexpr char digits[] = "0123456789abcdef";
    out += "\\x";
    out += digits[c >> 4];
    out += digits[c & 15];
}

/// The length of the well-formed UTF-8 sequence of two or more bytes at the start of `text`, 0
/// where there is none. Control characters of that range (U+0080 to U+009F) count as malformed.
std::size_t SequenceLength(std::string_view text) {
    auto const byte = [&](std::size_t i) {
        return i < text.size() ? static_cast<unsigned char>(text[i]) : 0U;
    };
    unsigned const first = byte(0);
    std::size_t const length = first >= 0xf0 && first <= 0xf4   ? 4
                               : first >= 0xe0 && first <= 0xef ? 3
                               : first >= 0xc2 && first <= 0xdf ? 2
                                                                : 0;
    for (std::size_t i = 1; i < length; ++i) {
        if ((byte(i) & 0xc0U) != 0x80U) {
            return 0;
        }
    }
    unsigned const second = byte(1);
    bool const malformed = (first == 0xc2 && second < 0xa0) || (first == 0xe0 && second < 0xa0) ||
                           (first == 0xed && second > 0x9f) || (first == 0xf0 && second < 0x90) ||
                           (first == 0xf4 && second > 0x8f);
    return malformed ? 0 : length;
}

std::string Escape(std::string_view text, bool keepLineFeeds) {
    std::string out;
    out.reserve(text.size());
    for (std::size_t i = 0; i < text.size();) {
        auto const c = static_cast<unsigned char>(text[i]);
        if (c >= 0x80) {
            if (auto const length = SequenceLength(text.substr(i)); length > 0) {
                out.append(text.substr(i, length));
                i += length;
                continue;
            }
        }
        if (c == '\t' || (c == '\n' && keepLineFeeds) || (c >= 0x20 && c < 0x7f)) {
            out += text[i];
        } else {
            AppendHex(out, c);
        }
        ++i;
    }
    return out;
}

char LowerChar(char c) {
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

} // namespace

std::vector<std::string_view> Lines(std::string_view text) {
    std::vector<std::string_view> lines;
    while (!text.empty()) {
        auto const end = text.find('\n');
        auto const length = end == std::string_view::npos ? text.size() : end + 1;
        lines.push_back(text.substr(0, length));
        text.remove_prefix(length);
    }
    return lines;
}

bool IsSpace(char c) noexcept {
    return c == ' ' || (c >= '\t' && c <= '\r');
}

bool IsBlank(std::string_view text) noexcept {
    for (char const c : text) {
        if (!IsSpace(c)) {
            return false;
        }
    }
    return true;
}

std::string Lower(std::string_view text) {
    std::string lower(text);
    for (char& c : lower) {
        c = LowerChar(c);
    }
    return lower;
}

bool EqualNoCase(std::string_view left, std::string_view right) noexcept {
    if (left.size() != right.size()) {
        return false;
    }
    for (std::size_t i = 0; i < left.size(); ++i) {
        if (LowerChar(left[i]) != LowerChar(right[i])) {
            return false;
        }
    }
    return true;
}

std::string Escaped(std::string_view text) {
    return Escape(text, false);
}

std::string EscapedLines(std::string_view text) {
    return Escape(text, true);
}

std::string Counted(std::size_t count, std::string_view noun) {
    std::string text = std::to_string(count) + " ";
    text += noun;
    if (count != 1) {
        text += 's';
    }
    return text;
}

} // namespace tessel::tslauthctl
