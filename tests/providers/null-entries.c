/* SPDX-License-Identifier: Apache-2.0 */
/* Has both records and not a single entry. */
#include "Records.h"

METADATA(2, "a b");
OPERATIONS_WITHOUT_ENTRIES(2);
