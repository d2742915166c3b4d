// SPDX-License-Identifier: Apache-2.0
#include "terminal/EscapedText.h"

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

} // namespace

std::string Escaped(std::string_view text) {
    return Escape(text, false);
}

std::string EscapedLines(std::string_view text) {
    return Escape(text, true);
}

} // namespace tessel::tslauthctl
