/* SPDX-License-Identifier: Apache-2.0 */
/* Has the record and not a single entry. */
#include <tslauth/tslauth_cam_provider.h>

CAMProxyClientOperationsRecord const CAMProxyClientOperations = {.apiVersion = 0};
