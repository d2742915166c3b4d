/* SPDX-License-Identifier: Apache-2.0 */
/* Was written for an interface that does not exist yet. */
#include "Records.h"

METADATA(3, "a b");
OPERATIONS_WITHOUT_ENTRIES(2);
