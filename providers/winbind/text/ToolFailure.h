// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <tslauth/tslauth_provider.h>

#include <string>
#include <string_view>

/// What a failed tool of Samba's means. Its exit status is the same for every failure; only its
/// text tells them apart.
namespace tessel::winbind {

/// The code that names best what `output`, the standard output and error of `net` together, says;
/// TSLAUTH_WINBIND_SEE_SYSTEM_LOG where nothing in it is known. Never 0, also for the output of a
/// success.
ActiveDirectoryClientErrorCode ToolFailureCode(std::string_view output);

/// `output` as one line for the system log: without blank lines, debug headers and control
/// characters, and with its end kept where it is long, because tools say last why they gave up.
std::string ToolFailureText(std::string_view output);

} // namespace tessel::winbind
