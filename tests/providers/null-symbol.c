/* SPDX-License-Identifier: Apache-2.0 */
/* Its metadata stand at address 0: the loader finds the symbol, and nothing there. */
#include "Records.h"

__asm__(".globl ActiveDirectoryClientMetadata\n"
        ".type ActiveDirectoryClientMetadata, %object\n"
        "ActiveDirectoryClientMetadata = 0\n");
OPERATIONS_WITHOUT_ENTRIES(2);
