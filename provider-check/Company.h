// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "Session.h"

/// Entries that have company: of other threads, of a thread that is cancelled, of a process that
/// forks.
namespace tessel::providercheck {

void LookAtThreads(Session& session);
void LookAtCancelled(Session& session);
void LookAtForked(Session& session);

} // namespace tessel::providercheck
