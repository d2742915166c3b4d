// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMCONFIGURATION_PAMSTACK_H
#define TSLAUTH_SYSTEMCONFIGURATION_PAMSTACK_H

#include "../Export.h"
#include "PAMEntry.h"
#include "PAMFacility.h"

#include <deque>
#include <iosfwd>
#include <string>

namespace SystemConfiguration {

/// The lines of one management group, in the order in which PAM runs them. The entries are reached
/// as those of any `std::deque`.
///
/// A value; one object is used by one thread at a time. Not to be deleted through a pointer to
/// `std::deque`.
class TSLAUTH_EXPORT PAMStack : public std::deque<PAMEntry> {
public:
    /// Empty, of no facility. Its entries cannot be printed.
    PAMStack() = default;

    /// Empty.
    PAMStack(PAMFacility const& facility) : _facility(facility) {}

    PAMFacility Facility() const noexcept {
        return _facility;
    }

    /// The first entry of exactly this module, whatever its control and parameters; `end()` where
    /// there is none.
    iterator find(std::string const& module);
    const_iterator find(std::string const& module) const;

private:
    PAMFacility _facility;
};

/// Writes one line an entry: the facility's word, a tab, the entry, a line feed.
/// @throws InvalidFacilityException, InvalidControlException where a line has no text form; the
/// lines before it have been written then
TSLAUTH_EXPORT std::ostream& operator<<(std::ostream& out, PAMStack const& stack);

} // namespace SystemConfiguration

#endif
