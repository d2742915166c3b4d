// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_TEXT_H
#define TSLAUTHCTL_TEXT_H

#include <string>
#include <string_view>
#include <vector>

/// Small pure helpers for text that comes from files.
namespace tessel::tslauthctl {

/// The lines of a text, each with its line feed; the last one may lack it.
std::vector<std::string_view> Lines(std::string_view text);

/// The white space of `isspace` in the "C" locale, whatever the locale of the process.
bool IsSpace(char c) noexcept;

/// Whether nothing but white space is there.
bool IsBlank(std::string_view text) noexcept;

/// ASCII only.
std::string Lower(std::string_view text);
bool EqualNoCase(std::string_view left, std::string_view right) noexcept;

/// `text` with a line feed and every other control character but the tab as "\x1b", so that a file
/// cannot move the cursor or colour the screen of whoever looks at it. Bytes that are not UTF-8 are
/// shown the same way.
std::string Escaped(std::string_view text);

/// As `Escaped`, but line feeds stay: for a text of several lines.
std::string EscapedLines(std::string_view text);

/// "1 line", "2 lines"
std::string Counted(std::size_t count, std::string_view noun);

} // namespace tessel::tslauthctl

#endif
