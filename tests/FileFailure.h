// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_FILEFAILURE_H
#define TESTS_FILEFAILURE_H

#include <base/FileError.h>
#include <string>

/// The text of the failure that a call which reads or replaces files ends with; "(none)" if it
/// succeeds. Anything else that is thrown ends the test.
template <typename Call> std::string FailureOf(Call call) {
    try {
        call();
    } catch (tessel::base::FileError const& failure) {
        return failure.what();
    }
    return "(none)";
}

#endif
