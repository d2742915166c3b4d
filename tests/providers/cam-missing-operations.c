/* SPDX-License-Identifier: Apache-2.0 */
/* A library, but no CAM provider: the one symbol that counts is missing. */
#include <tslauth/tslauth_cam_provider.h>

TSLAUTH_CAM_PROVIDER_EXPORT int CAMProxyClientOperationsOfAnotherName(void);
int CAMProxyClientOperationsOfAnotherName(void) {
    return 0;
}
