// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "ProviderModules.h"

#include <string>
#include <string_view>

namespace tessel::authentication::ProviderModules {

/// The text of a PAM policy file after `edit`, with every line that the edit does not concern as it
/// was, byte for byte: comments, blank lines, `@include`, continued lines, line ends.
///
/// Where the library's model can read the text, entries stand where the model sees them; everywhere
/// else where libpam does.
///
/// `insert`: as `EditedPAMPolicy`, one line in "auth" and one in "account".
/// `remove`: takes every equal entry out of both, also a copy that only libpam understands. It
/// undoes an insertion byte for byte.
/// @throws ConfigurationError for an insertion after which libpam, or the model if it can read the
/// outcome, would not find the entry where it belongs: behind a continued line that the model does
/// not know as one, say. Also for one into a policy that libpam refuses, or that holds a NUL byte
std::string LosslessPAMPolicy(std::string_view text, Edit edit,
                              SystemConfiguration::PAMEntry const& entry);

} // namespace tessel::authentication::ProviderModules
