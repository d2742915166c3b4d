// SPDX-License-Identifier: Apache-2.0
#include <tslauth/systemconfiguration/PAMEntry.h>

#include "Output.h"
#include "PAMPolicyText.h"
#include "PAMReader.h"

namespace SystemConfiguration {

bool PAMEntry::operator==(PAMEntry const& other) const {
    PAMControl::Control const control = other._control;
    return _control == control && _module == other._module && _parameters == other._parameters;
}

std::istream& operator>>(std::istream& in, PAMEntry& entry) {
    StreamInput input(in);
    ReadControl(input, entry._control);
    std::string_view const module = input.Word();
    if (!module.empty()) {
        entry._module = module;
    }
    ReadParameters(input.Line(), entry._parameters);
    return in;
}

std::ostream& operator<<(std::ostream& out, PAMEntry const& entry) {
    return WriteTo(out, entry, PrintEntry);
}

} // namespace SystemConfiguration
