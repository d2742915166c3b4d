// SPDX-License-Identifier: Apache-2.0
#include <strandctl/AdvancedOptionBranch.h>

#include <charconv>
#include <strandctl/HostCtlException.h>
#include <system_error>

namespace HostCtl::Adv {

AdvancedOptionBranch::AdvancedOptionBranch(std::map<std::string, std::string> const& options)
    : _options(options) {}

AdvancedOptionBranch::~AdvancedOptionBranch() = default;

// The two fixed texts speak of the one branch that hosts have; support tools search for them.

AdvancedOptionBranch AdvancedOptionBranch::GetBranch(std::string const& name) const {
    AdvancedOptionBranch branch = *this;
    branch._prefix += name + ".";
    auto const first = _options.lower_bound(branch._prefix);
    if (first == _options.end() ||
        first->first.compare(0, branch._prefix.size(), branch._prefix) != 0) {
        throw Lib::HostCtlException("Unable to get user from root");
    }
    return branch;
}

AdvancedIntegerOption AdvancedOptionBranch::GetIntegerOption(std::string const& name) const {
    auto const option = _options.find(_prefix + name);
    if (option == _options.end()) {
        throw Lib::HostCtlException("Unable to get the user option");
    }
    std::string const& text = option->second;
    int value = 0;
    auto const parsed = std::from_chars(text.data(), text.data() + text.size(), value);
    if (parsed.ec != std::errc() || parsed.ptr != text.data() + text.size()) {
        throw Lib::HostCtlException("Unable to get advanced option " + option->first);
    }
    return {option->first, value};
}

} // namespace HostCtl::Adv
