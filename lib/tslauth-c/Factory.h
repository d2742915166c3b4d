// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <tslauth/AuthenticationStoreFactory.h>
#include <tslauth/HostLock.h>

namespace tessel::tslauth_c {

inline constexpr char ActiveDirectoryStoreName[] = "Active Directory";

/// The process's factory: that of its C++ part, where it has one, else one of this library's, which
/// lives as long as the process.
authentication::AuthenticationStoreFactory& Factory();

/// @throws Failure TSLAUTH_ERROR_LOCKED where another holds it for longer than `seconds`
void TakeLock(authentication::HostLock& lock, int seconds);

} // namespace tessel::tslauth_c
