/* SPDX-License-Identifier: Apache-2.0 */
/* States a negative version in both records. */
#include "Records.h"

METADATA(-1, "a b");
OPERATIONS_WITHOUT_ENTRIES(-1);
