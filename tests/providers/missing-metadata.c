/* SPDX-License-Identifier: Apache-2.0 */
/* Exports the operations alone. */
#include "Records.h"

OPERATIONS_WITHOUT_ENTRIES(2);
