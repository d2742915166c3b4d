/* SPDX-License-Identifier: Apache-2.0 */
/* States version 0 in both records. */
#include "Records.h"

METADATA(0, "a b");
OPERATIONS_WITHOUT_ENTRIES(0);
