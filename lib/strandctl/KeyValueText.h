// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_KEYVALUETEXT_H
#define STRANDCTL_KEYVALUETEXT_H

#include <map>
#include <string>
#include <string_view>

namespace StrandCtl {

/// The assignments of a file of `key = "value"` lines, the first one of each key. Blanks (space and
/// tab) around a key or a value and one pair of quotes around it, of either kind, are not part of
/// it; what holds nothing but blanks is left as it is. Blank lines are skipped. There are no
/// comments and no escapes.
/// @throws HostCtl::Lib::HostCtlException for a line without "=" and for a field that is one lone
///         quote; the text names the line
std::map<std::string, std::string> ParseKeyValueText(std::string_view text);

} // namespace StrandCtl

#endif
