// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_HOSTCTLFAILURE_H
#define TESTS_HOSTCTLFAILURE_H

#include <strandctl/HostCtlException.h>
#include <string>

/// The text of the failure that a call of the host-control library ends with; "(none)" if it
/// succeeds. Anything else that is thrown ends the test.
template <typename Call> std::string FailureOf(Call call) {
    try {
        call();
    } catch (HostCtl::Lib::HostCtlException const& failure) {
        return failure.what();
    }
    return "(none)";
}

#endif
