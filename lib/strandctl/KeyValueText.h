// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_KEYVALUETEXT_H
#define STRANDCTL_KEYVALUETEXT_H

#include <map>
#include <string>
#include <string_view>

namespace StrandCtl {

/// The assignments of a file of `key = "value"` lines (<base/KeyValueText.h>), the first one of
/// each key.
/// @throws HostCtl::Lib::HostCtlException for a line without "=" and for a field that is one lone
///         quote; the text names the line
std::map<std::string, std::string> ParseKeyValueText(std::string_view text);

} // namespace StrandCtl

#endif
