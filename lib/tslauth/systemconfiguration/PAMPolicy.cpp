// SPDX-License-Identifier: Apache-2.0
#include <tslauth/systemconfiguration/PAMPolicy.h>

#include "Output.h"
#include "PAMPolicyText.h"
#include "PAMReader.h"

namespace SystemConfiguration {

PAMPolicy::PAMPolicy(std::string const& name) : _name(name) {}

PAMStack& PAMPolicy::operator[](PAMFacility facility) {
    return _stacks.try_emplace(facility, facility).first->second;
}

std::istream& operator>>(std::istream& in, PAMPolicy& policy) {
    StreamInput input(in);
    ReadLines(input, policy);
    return in;
}

std::ostream& operator<<(std::ostream& out, PAMPolicy const& policy) {
    return WriteTo(out, policy, PrintPolicy);
}

} // namespace SystemConfiguration
