/* SPDX-License-Identifier: Apache-2.0 */
/* Hands out static memory and no function to release it. */
#define FREE_FUNCTION NULL
#include "RecordingEntries.h"
