/* SPDX-License-Identifier: Apache-2.0 */
/* Newer operations than metadata. */
#define METADATA_VERSION 1
#define OPERATIONS_VERSION 2
#include "RecordingEntries.h"
