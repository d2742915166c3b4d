/* SPDX-License-Identifier: Apache-2.0 */
/* Its parameters are separated by runs of white space of every kind. */
#include "Records.h"

METADATA(2, "a  b\tc");
OPERATIONS_WITHOUT_ENTRIES(2);
