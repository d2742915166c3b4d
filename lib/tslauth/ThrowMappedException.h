// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_THROWMAPPEDEXCEPTION_H
#define TSLAUTH_THROWMAPPEDEXCEPTION_H

#include <tslauth/tslauth_provider.h>

namespace tessel::authentication {

/// Throws the exception that stands for a provider's error `code`: its own class and text for each
/// code that `tslauth_provider.h` names, `UnknownException` for every other, so that no failure
/// goes unreported. 0 is success and ends the process: it is the adapter's mistake to ask.
[[noreturn]] void ThrowMappedException(ActiveDirectoryClientErrorCode code);

} // namespace tessel::authentication

#endif
