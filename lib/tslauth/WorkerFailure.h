// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_WORKERFAILURE_H
#define TSLAUTH_WORKERFAILURE_H

#include <tslauth/Exceptions.h>

namespace tessel::authentication {

/// What a worker reports that ended with none of the library's own failures.
extern Exception const& WorkerFailure;

} // namespace tessel::authentication

#endif
