// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tessel::winbind {

/// Tells the system log, at warning priority, what an operation passes over without failing.
void LogWarning(std::string const& text) noexcept;

} // namespace tessel::winbind
