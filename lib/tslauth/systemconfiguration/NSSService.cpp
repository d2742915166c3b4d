// SPDX-License-Identifier: Apache-2.0
#include <tslauth/systemconfiguration/NSSService.h>

#include "NSSConfigurationText.h"
#include "Output.h"

namespace SystemConfiguration {

bool NSSService::operator==(NSSService const& other) const {
    return _module == other._module && _parameters == other._parameters;
}

std::ostream& operator<<(std::ostream& out, NSSService const& service) {
    return WriteTo(out, service, PrintService);
}

} // namespace SystemConfiguration
