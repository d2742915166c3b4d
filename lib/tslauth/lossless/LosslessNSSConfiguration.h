// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "ProviderModules.h"

#include <string>
#include <string_view>

namespace tessel::authentication::ProviderModules {

/// The text of a name-service switch file after `edit`, with everything that the edit does not
/// concern as it was, byte for byte: comments, blanks, databases that the library's model does not
/// know, services behind brackets that it passes over.
///
/// `insert`: puts `service` first in "passwd", "group" and "shadow", unless the model, or the C
/// library where the model cannot read the line, finds an equal one there. A database without a
/// line gets one that also names what the C library asks without a line; the comment above it says
/// so.
/// `remove`: takes every equal service out of the lines of the three, and with it a line that an
/// insertion has added. It undoes an insertion byte for byte.
/// @throws ConfigurationError for an insertion after which the C library, or the model if it can
/// read the outcome, would not find the service where it belongs: in the first of two lines for a
/// database, say, of which the C library uses the last. Also for one into a file with a NUL byte
std::string LosslessNSSConfiguration(std::string_view text, Edit edit,
                                     SystemConfiguration::NSSService const& service);

} // namespace tessel::authentication::ProviderModules
