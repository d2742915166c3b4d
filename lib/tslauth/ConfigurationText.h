// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_CONFIGURATIONTEXT_H
#define TSLAUTH_CONFIGURATIONTEXT_H

#include <base/KeyValueText.h>
#include <map>
#include <string>
#include <string_view>

/// The library's own key-value files: text in, text out. No file is opened here.
namespace tessel::authentication {

/// @param line one that is not blank, without its line feed
/// @throws ConfigurationError
base::Assignment SplitLine(std::string_view line, int lineNumber);

/// Adds the assignments of a whole file to an empty map; the first of a key wins.
/// @throws ConfigurationError at the first bad line
void ReadAssignments(std::string_view text, std::map<std::string, std::string>& map);

/// @throws InvalidKeyException, always
[[noreturn]] void ThrowMissingKey(std::string const& key);

/// Makes `line` the line of an assignment. Its length is known first, because growing it piece by
/// piece takes longer than everything else that a line costs besides its system call.
void AssignLine(std::string& line, base::Assignment const& assignment);

} // namespace tessel::authentication

#endif
