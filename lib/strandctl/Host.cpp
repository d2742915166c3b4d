// SPDX-License-Identifier: Apache-2.0
#include <strandctl/Host.h>

#include "Files.h"
#include "KeyValueText.h"
#include "Paths.h"

#include <optional>
#include <strandctl/HostCtlException.h>
#include <string>

namespace HostCtl {

Host::Host() = default;

Host::~Host() = default;

Adv::AdvancedOptionBranch Host::GetAdvancedOptionRoot() const {
    static constexpr char failure[] = "Unable to get root option branch";
    std::optional<std::string> text;
    try {
        text = StrandCtl::ReadFile(StrandCtl::Paths::AdvancedOptions);
        if (text) {
            return Adv::AdvancedOptionBranch(StrandCtl::ParseKeyValueText(*text));
        }
    } catch (Lib::HostCtlException const& exception) {
        throw Lib::HostCtlException(std::string(failure) + ": " + exception.what());
    }
    throw Lib::HostCtlException(failure);
}

} // namespace HostCtl
