// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMCONFIGURATION_PAMPOLICY_H
#define TSLAUTH_SYSTEMCONFIGURATION_PAMPOLICY_H

#include "../Export.h"
#include "PAMFacility.h"
#include "PAMStack.h"

#include <iosfwd>
#include <map>
#include <string>

namespace SystemConfiguration {

/// A PAM policy file: one stack of module lines a management group.
///
/// It holds what PAM runs and nothing else. Comments, blank lines, spacing and the interleaving of
/// different groups are not kept, and a file that uses `@include`, continuation lines or a leading
/// minus is refused. The policy does not know its path and opens no file.
///
/// A value; one object is used by one thread at a time.
class TSLAUTH_EXPORT PAMPolicy {
public:
    /// An empty policy.
    /// @param name the name that services know the policy by: its file's name without directory
    explicit PAMPolicy(std::string const& name);

    /// The stack of a group. Where there is none yet, an empty one is made, which the writer then
    /// shows as an empty line. The reference stays valid as long as the policy does.
    PAMStack& operator[](PAMFacility facility);

    /// The stacks there are, in the order in which they are written. Unlike `operator[]`, looking
    /// does not make one.
    std::map<PAMFacility, PAMStack> const& Stacks() const noexcept {
        return _stacks;
    }

    std::string const& Name() const noexcept {
        return _name;
    }

private:
    std::string _name;
    std::map<PAMFacility, PAMStack> _stacks;
};

/// Reads a policy up to the end of the stream and appends its lines to the stacks there are. A line
/// that the end of the input cuts short is kept, with the missing fields empty.
/// @throws InvalidFacilityException, InvalidControlException at the first line that is not
/// understood; the lines before it stay in the policy, and the stream stands after the bad word
TSLAUTH_EXPORT std::istream& operator>>(std::istream& in, PAMPolicy& policy);

/// Writes the normalised file: "#%PAM-1.0", an empty line, then each stack followed by an empty
/// line, in the order account, auth, password, session.
/// @throws InvalidFacilityException, InvalidControlException where a line has no text form; the
/// lines before it have been written then
TSLAUTH_EXPORT std::ostream& operator<<(std::ostream& out, PAMPolicy const& policy);

} // namespace SystemConfiguration

#endif
