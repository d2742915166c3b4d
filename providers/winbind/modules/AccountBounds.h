// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>

/// How long a log-in waits for the domain's word on a user. With a controller that answers it takes
/// a fifth of a second.
namespace tessel::winbind::AccountBounds {

/// For winbindd and the controller.
inline constexpr std::chrono::seconds Question(4);
/// For a connection to a controller, where one may be missing.
inline constexpr std::chrono::milliseconds Look(1500);
/// For the program that asks them, which ends by itself before.
inline constexpr std::chrono::seconds Program(5);

} // namespace tessel::winbind::AccountBounds
