/* SPDX-License-Identifier: Apache-2.0 */
/* Exports the metadata alone. */
#include "Records.h"

METADATA(2, "a b");
