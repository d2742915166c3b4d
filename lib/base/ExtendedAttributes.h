// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <map>
#include <optional>
#include <string>

namespace tessel::base {

/// By name: access control lists and security labels are among them. What the kernel computes from
/// the contents of a file is not.
using ExtendedAttributes = std::map<std::string, std::string>;

/// Those of an open file; none where its file system knows no such attributes.
/// @return nothing where the file system fails; `errno` says why
std::optional<ExtendedAttributes> ReadExtendedAttributes(int file);

/// Gives an open file these attributes, and none besides.
/// @return whether it worked; otherwise `errno` says why not
bool SetExtendedAttributes(int file, ExtendedAttributes const& wanted);

} // namespace tessel::base
