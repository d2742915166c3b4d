// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "Recorder.h"

#include <string>
#include <vector>

/// Takes the place of syslog(3) for all that the process loads: what a provider says is looked at
/// and goes nowhere.
namespace tessel::providercheck::SystemLog {

/// @param secrets that no text may hold; empty ones do not count
void Watch(Recorder* recorder, std::vector<std::string> secrets);

/// Looks at another text that people read.
void LookAt(char const* text);

} // namespace tessel::providercheck::SystemLog
