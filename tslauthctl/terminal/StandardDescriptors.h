// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_STANDARD_DESCRIPTORS_H
#define TSLAUTHCTL_STANDARD_DESCRIPTORS_H

namespace tessel::tslauthctl {

/// Opens what is closed of the standard input, output and error, so that no file, pipe or
/// connection that is opened later takes their numbers, and is read as a password or written to as
/// a terminal. What is opened fails where it is used, as the closed one would: it cannot be read
/// in the place of the input, nor written in that of an output. To be called before anything else
/// opens a descriptor. Where nothing can be opened, everything stays as it was.
void OpenClosedStandardDescriptors();

} // namespace tessel::tslauthctl

#endif
