/* SPDX-License-Identifier: Apache-2.0 */
/* Newer metadata than operations, which are filled to the last entry all the same. */
#define METADATA_VERSION 2
#define OPERATIONS_VERSION 1
#include "RecordingEntries.h"
