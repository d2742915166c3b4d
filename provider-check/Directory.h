// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "Session.h"

/// A real directory, which the profile names: the host joins it, and parts again.
namespace tessel::providercheck {

void Join(Session& session, Profile const& profile);
/// In another process than `Join`.
void Part(Session& session, Profile const& profile);

} // namespace tessel::providercheck
