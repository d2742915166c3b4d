// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_ADVANCEDOPTIONBRANCH_H
#define STRANDCTL_ADVANCEDOPTIONBRANCH_H

#include "AdvancedIntegerOption.h"
#include "Export.h"

#include <map>
#include <string>

namespace HostCtl {
namespace Adv {

/// A branch of the tree that the host's advanced options form: "UserVars.Example" is the option
/// "Example" in the branch "UserVars" below the root. A value: it holds the options as they were
/// when the root was asked for.
class STRANDCTL_EXPORT AdvancedOptionBranch {
public:
    /// The root.
    /// @param options the full names of all options, with their values
    explicit AdvancedOptionBranch(std::map<std::string, std::string> const& options);
    ~AdvancedOptionBranch();
    AdvancedOptionBranch(AdvancedOptionBranch const&) = default;
    AdvancedOptionBranch& operator=(AdvancedOptionBranch const&) = default;

    /// The branch of that name below this one.
    /// @throws HostCtl::Lib::HostCtlException "Unable to get user from root" if no option is in it
    AdvancedOptionBranch GetBranch(std::string const& name) const;

    /// The option of that name in this branch.
    /// @throws HostCtl::Lib::HostCtlException "Unable to get the user option" if there is none;
    ///         "Unable to get advanced option " + its full name if its value is not a whole number
    ///         (decimal digits, "-" before them allowed) that an `int` can hold
    AdvancedIntegerOption GetIntegerOption(std::string const& name) const;

private:
    std::map<std::string, std::string> _options;
    std::string _prefix;
};

} // namespace Adv
} // namespace HostCtl

#endif
