/* SPDX-License-Identifier: Apache-2.0 */
/* Its parameters are nothing but white space. */
#include "Records.h"

METADATA(2, " \t\n ");
OPERATIONS_WITHOUT_ENTRIES(2);
