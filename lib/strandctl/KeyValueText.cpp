// SPDX-License-Identifier: Apache-2.0
#include "KeyValueText.h"

#include <base/KeyValueText.h>
#include <strandctl/HostCtlException.h>

namespace StrandCtl {

std::map<std::string, std::string> ParseKeyValueText(std::string_view text) {
    std::map<std::string, std::string> assignments;
    try {
        tessel::base::ForEachAssignment(text, [&](tessel::base::Assignment const& assignment) {
            assignments.emplace(assignment.key, assignment.value);
        });
    } catch (tessel::base::KeyValueError const& error) {
        throw HostCtl::Lib::HostCtlException(error.what());
    }
    return assignments;
}

} // namespace StrandCtl
