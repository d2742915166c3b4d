// SPDX-License-Identifier: Apache-2.0
#include "terminal/StandardDescriptors.h"

#include <cerrno>
#include <fcntl.h>
#include <unistd.h>

namespace tessel::tslauthctl {

void OpenClosedStandardDescriptors() {
    for (int descriptor = STDIN_FILENO; descriptor <= STDERR_FILENO; ++descriptor) {
        if (fcntl(descriptor, F_GETFD) >= 0 || errno != EBADF) {
            continue;
        }
        // The lowest number that is free is this one. Children get it as well, for their sake too.
        int const opened = open("/dev/null", descriptor == STDIN_FILENO ? O_WRONLY : O_RDONLY);
        (void)opened; // it stays open as long as the process lives
    }
}

} // namespace tessel::tslauthctl
