// SPDX-License-Identifier: Apache-2.0
#include <strandctl/AdvancedIntegerOption.h>

namespace HostCtl::Adv {

AdvancedIntegerOption::AdvancedIntegerOption(std::string const& name, int value)
    : _name(name), _value(value) {}

AdvancedIntegerOption::~AdvancedIntegerOption() = default;

std::string AdvancedIntegerOption::GetName() const {
    return _name;
}

int AdvancedIntegerOption::GetValue() const {
    return _value;
}

} // namespace HostCtl::Adv
