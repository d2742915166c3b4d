// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_HOSTFACTORY_H
#define STRANDCTL_HOSTFACTORY_H

#include "Export.h"
#include "Host.h"

namespace HostCtl {

/// Where a program gets the host from.
class STRANDCTL_EXPORT HostFactory {
public:
    HostFactory() = delete;

    /// The host that this process runs on. On plain Linux there always is one; elsewhere a failure
    /// is a `HostCtl::Lib::HostCtlException` "Unable to get host".
    static Host GetHost();
};

} // namespace HostCtl

#endif
