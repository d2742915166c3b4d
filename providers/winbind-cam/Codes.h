// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "../winbind/tslauth_winbind_provider.h"

#include <tslauth/tslauth_provider.h>

/// The codes of this provider; README.md tells an administrator what to do about each. The
/// numbering is that of the Windows system error codes. CAMProxy has a class for five of them: the
/// others reach the user as an unknown exception that carries the number.
namespace tessel::winbind::cam::Codes {

using Code = ActiveDirectoryClientErrorCode;

inline constexpr Code NoCodeOnThisHost = 2;
inline constexpr Code CodeRefused = 5;
inline constexpr Code NotEnoughMemory = 8;
inline constexpr Code InvalidAnswer = 13;
inline constexpr Code InvalidParameter = 87;
inline constexpr Code InvalidComputerName = 1210;
inline constexpr Code ConnectionRefused = 1225;
inline constexpr Code ConnectionInvalid = 1229;
inline constexpr Code AccountExists = 1316;
inline constexpr Code CodeNotProtected = 1338;
inline constexpr Code ServiceFailed = 1359;
inline constexpr Code TooManyAttempts = 1909;
inline constexpr Code TimedOut = 10060;
inline constexpr Code InvalidCertificate = 0x80090325;
inline constexpr Code Unknown = TSLAUTH_WINBIND_SEE_SYSTEM_LOG;

} // namespace tessel::winbind::cam::Codes
