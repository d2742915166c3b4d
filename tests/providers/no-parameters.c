/* SPDX-License-Identifier: Apache-2.0 */
/* Its modules take no parameters. */
#include "Records.h"

METADATA(2, NULL);
OPERATIONS_WITHOUT_ENTRIES(2);
