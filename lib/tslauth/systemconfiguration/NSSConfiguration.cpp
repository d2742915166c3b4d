// SPDX-License-Identifier: Apache-2.0
#include <tslauth/systemconfiguration/NSSConfiguration.h>

#include "NSSConfigurationText.h"
#include "Output.h"

#include <istream>
#include <string>

namespace SystemConfiguration {

std::deque<NSSService>& NSSConfiguration::operator[](NSSDatabase database) {
    return _databases[database];
}

std::istream& operator>>(std::istream& in, NSSConfiguration& configuration) {
    NSSLineReader reader(configuration);
    for (std::string line; std::getline(in, line);) {
        reader.Read(line);
    }
    return in;
}

std::ostream& operator<<(std::ostream& out, NSSConfiguration const& configuration) {
    return WriteTo(out, configuration, PrintConfiguration);
}

} // namespace SystemConfiguration
