// SPDX-License-Identifier: Apache-2.0
#include "WorkerFailure.h"

#include "ThrowMappedException.h"

namespace tessel::authentication {

// Made when the library is loaded, because the failure may be that there is no memory, and never
// destroyed, because a worker may still run when the process ends. 1359 is ERROR_INTERNAL_ERROR.
Exception const& WorkerFailure = *new InternalErrorException(
    TSLAUTH_PROVIDER_INTERNAL_ERROR, FindMappedException(TSLAUTH_PROVIDER_INTERNAL_ERROR).text);

} // namespace tessel::authentication
