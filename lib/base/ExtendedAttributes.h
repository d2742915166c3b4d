// SPDX-License-Identifier: Apache-2.0
#pragma once

namespace tessel::base {

/// Gives the file `to` the extended attributes of `from`, and none besides: access control lists
/// and security labels are among them. What the kernel computes from the contents is left to it.
/// @return whether it worked; otherwise `errno` says why not
bool CopyExtendedAttributes(int from, int to);

} // namespace tessel::base
