// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_ESCAPEDTEXT_H
#define TSLAUTHCTL_ESCAPEDTEXT_H

#include <string>
#include <string_view>

/// Text of files, made fit for a terminal.
namespace tessel::tslauthctl {

/// `text` with a line feed and every other control character but the tab as "\x1b", so that a file
/// cannot move the cursor or colour the screen of whoever looks at it. Bytes that are not UTF-8 are
/// shown the same way.
std::string Escaped(std::string_view text);

/// As `Escaped`, but line feeds stay: for a text of several lines.
std::string EscapedLines(std::string_view text);

} // namespace tessel::tslauthctl

#endif
