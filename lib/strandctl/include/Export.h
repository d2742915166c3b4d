// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_EXPORT_H
#define STRANDCTL_EXPORT_H

/// Marks what callers of the library may link against. Everything else is compiled with hidden
/// visibility, and the version script repeats the rule for the linker.
#define STRANDCTL_EXPORT __attribute__((visibility("default")))

#endif
