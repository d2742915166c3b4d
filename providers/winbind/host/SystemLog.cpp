// SPDX-License-Identifier: Apache-2.0
#include "host/SystemLog.h"

#include <syslog.h>

namespace tessel::winbind {

void LogWarning(std::string const& text) noexcept {
    ::syslog(LOG_WARNING, "winbind: %s", text.c_str());
}

} // namespace tessel::winbind
