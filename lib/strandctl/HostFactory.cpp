// SPDX-License-Identifier: Apache-2.0
#include <strandctl/HostFactory.h>

namespace HostCtl {

Host HostFactory::GetHost() {
    return {};
}

} // namespace HostCtl
