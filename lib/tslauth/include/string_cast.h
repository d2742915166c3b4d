// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_STRING_CAST_H
#define TSLAUTH_STRING_CAST_H

#include <locale>
#include <sstream>
#include <string>

namespace tessel {
namespace authentication {

/// The text that `value` prints as: decimal digits for an integer, the characters for text.
/// The classic "C" locale is used whatever the process's global locale is, so that a number in an
/// error message never grows thousands separators.
template <typename T> std::string string_cast(T const& value) {
    std::ostringstream text;
    text.imbue(std::locale::classic());
    text << value;
    return text.str();
}

} // namespace authentication
} // namespace tessel

#endif
