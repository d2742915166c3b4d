/* SPDX-License-Identifier: Apache-2.0 */
/* Is built as lib.so: what an empty provider name leads to. */
#include "Records.h"

METADATA(2, "empty name");
OPERATIONS_WITHOUT_ENTRIES(2);
