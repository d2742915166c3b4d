// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_PREPARE_H
#define TSLAUTHCTL_PREPARE_H

#include <tslauth/ActivationPlan.h>

#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

/// The smallest edit after which the library carries a file without loss: through an activation, a
/// second one, and back again. Lines that it carries as they are stay byte for byte. No file is
/// opened here.
namespace tessel::tslauthctl {

using authentication::ProviderEntries;

/// Gives a file of the host by its path, for the policies that a policy includes; nothing where it
/// cannot be read.
using HostFiles = std::function<std::optional<std::string>(std::string const&)>;

struct PreparedLine {
    /// From 1; 0 where the finding belongs to the file as a whole.
    std::size_t number;
    /// The line as it was, without its line end; empty for one that is added.
    std::string before;
    /// What stands there now; empty for a line that is dropped.
    std::string after;
    std::string reason;
};

struct Prepared {
    std::string text;
    /// The edits made. All of them keep the meaning, unless a loss was accepted.
    std::vector<PreparedLine> edits;
    /// Where there is no edit that keeps the meaning.
    std::vector<PreparedLine> impossible;
};

/// @param acceptLoss also edit lines that cannot keep their meaning, where the library can carry
///        the rest of them; what is lost stands in `impossible` all the same
Prepared PrepareNSS(std::string_view text, ProviderEntries const& provider, bool acceptLoss);
Prepared PreparePAM(std::string_view text, ProviderEntries const& provider, HostFiles const& files,
                    bool acceptLoss);

/// Entries of no provider in particular, for a host without one.
ProviderEntries PlaceholderEntries();

} // namespace tessel::tslauthctl

#endif
