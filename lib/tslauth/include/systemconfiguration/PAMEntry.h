// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMCONFIGURATION_PAMENTRY_H
#define TSLAUTH_SYSTEMCONFIGURATION_PAMENTRY_H

#include "../Export.h"
#include "PAMControl.h"

#include <cstddef>
#include <iosfwd>
#include <list>
#include <string>
#include <utility>

namespace SystemConfiguration {

/// One module line of a PAM policy without its facility, which the stack that holds it knows.
///
/// A value that moves without allocating; one object is used by one thread at a time.
class TSLAUTH_EXPORT PAMEntry {
public:
    /// The control `PAMControl::none`, an empty module, no parameters. Such an entry cannot be
    /// printed.
    PAMEntry() = default;

    /// @param module the path or name as it is to stand in the file; for `include` and `substack`
    /// the name of a policy
    PAMEntry(PAMControl control, std::string module) noexcept
        : _control(std::move(control)), _module(std::move(module)) {}

    /// The same for a module that is part of a longer text.
    PAMEntry(PAMControl control, char const* module, std::size_t length)
        : _control(std::move(control)), _module(module, length) {}

    PAMControl const& control() const noexcept {
        return _control;
    }

    std::string const& module() const noexcept {
        return _module;
    }

    /// The module's arguments in file order, to be edited in place.
    std::list<std::string>& parameters() noexcept {
        return _parameters;
    }
    std::list<std::string> const& parameters() const noexcept {
        return _parameters;
    }

    /// Equal control values, modules and parameters. The texts of two bracketed controls are not
    /// compared: deliberate, and unlike `PAMControl::operator==`. A line that an administrator has
    /// tuned between the brackets is still found as the same line.
    bool operator==(PAMEntry const& other) const;
    bool operator!=(PAMEntry const& other) const {
        return !(*this == other);
    }

private:
    friend TSLAUTH_EXPORT std::istream& operator>>(std::istream& in, PAMEntry& entry);

    PAMControl _control;
    std::string _module;
    std::list<std::string> _parameters;
};

/// Reads what follows the facility word of a line: control, module, and the parameters up to the
/// end of the line. Control and module may stand on a later line than where the stream is; a
/// bracketed control is joined with single spaces, and one that is never closed takes the rest of
/// the input. Quotes and brackets have no meaning in parameters. Parameters are added to those that
/// the entry already has.
///
/// Where the input ends early, the missing fields stay as they were and the stream is in the fail
/// state; it is so too where the input ends directly after the module.
/// @throws InvalidControlException; the stream has consumed the control, and the entry is unchanged
TSLAUTH_EXPORT std::istream& operator>>(std::istream& in, PAMEntry& entry);

/// Writes the control, a tab, the module, a tab, and each parameter followed by a space. No line
/// end.
/// @throws InvalidControlException for a control that was never set
TSLAUTH_EXPORT std::ostream& operator<<(std::ostream& out, PAMEntry const& entry);

} // namespace SystemConfiguration

#endif
