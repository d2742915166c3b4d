/* SPDX-License-Identifier: Apache-2.0 */
/* One entry calls a function that is nowhere. Only a loader that binds functions when they are
 * first called can load it. */
#include "Records.h"

int tslauth_tests_nowhere(void);

static int CallNowhere(void) {
    return tslauth_tests_nowhere();
}

METADATA(2, NULL);
ActiveDirectoryClientOperationsRecord const ActiveDirectoryClientOperations = {
    .apiVersion = 2, .getDomainTrustState = CallNowhere};
