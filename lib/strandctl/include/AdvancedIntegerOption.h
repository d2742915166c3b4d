// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_ADVANCEDINTEGEROPTION_H
#define STRANDCTL_ADVANCEDINTEGEROPTION_H

#include "Export.h"

#include <string>

namespace HostCtl {
namespace Adv {

/// An advanced option of the host whose value is a whole number. A value: it does not follow later
/// changes of the file it was read from.
class STRANDCTL_EXPORT AdvancedIntegerOption {
public:
    AdvancedIntegerOption(std::string const& name, int value);
    ~AdvancedIntegerOption();
    AdvancedIntegerOption(AdvancedIntegerOption const&) = default;
    AdvancedIntegerOption& operator=(AdvancedIntegerOption const&) = default;

    /// The full name, with the branches, as in "UserVars.Example".
    std::string GetName() const;
    int GetValue() const;

private:
    std::string _name;
    int _value;
};

} // namespace Adv
} // namespace HostCtl

#endif
