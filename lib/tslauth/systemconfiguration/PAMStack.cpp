// SPDX-License-Identifier: Apache-2.0
#include <tslauth/systemconfiguration/PAMStack.h>

#include "Output.h"
#include "PAMPolicyText.h"

#include <algorithm>

namespace SystemConfiguration {

namespace {

template <typename Stack> auto FindIn(Stack& stack, std::string const& module) {
    return std::find_if(stack.begin(), stack.end(),
                        [&](PAMEntry const& entry) { return entry.module() == module; });
}

} // namespace

PAMStack::iterator PAMStack::find(std::string const& module) {
    return FindIn(*this, module);
}

PAMStack::const_iterator PAMStack::find(std::string const& module) const {
    return FindIn(*this, module);
}

std::ostream& operator<<(std::ostream& out, PAMStack const& stack) {
    return WriteTo(out, stack, PrintStack);
}

} // namespace SystemConfiguration
