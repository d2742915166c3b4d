/* SPDX-License-Identifier: Apache-2.0 */
/* Has every entry, the unused one included, and writes down what reaches it. */
#include "RecordingEntries.h"
