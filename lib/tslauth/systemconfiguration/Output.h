// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMCONFIGURATION_OUTPUT_H
#define TSLAUTH_SYSTEMCONFIGURATION_OUTPUT_H

#include <ostream>
#include <string>

namespace SystemConfiguration {

/// Writes what `print` makes of `value`. Where it throws, what it made before that is written all
/// the same: whoever prints to a stream sees how far it got.
template <typename Value>
std::ostream& WriteTo(std::ostream& out, Value const& value,
                      void (*print)(Value const&, std::string&)) {
    std::string text;
    auto const write = [&] { out.write(text.data(), static_cast<std::streamsize>(text.size())); };
    try {
        print(value, text);
    } catch (...) {
        write();
        throw;
    }
    write();
    return out;
}

} // namespace SystemConfiguration

#endif
