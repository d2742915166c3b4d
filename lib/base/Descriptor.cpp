// SPDX-License-Identifier: Apache-2.0
#include "Descriptor.h"

#include <cerrno>

namespace tessel::base {

void Descriptor::Close() noexcept {
    if (_number >= 0) {
        int const error = errno;
        (void)::close(Release());
        errno = error;
    }
}

} // namespace tessel::base
