// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "samba/SambaTools.h"

#include <chrono>
#include <string>

namespace tessel::winbind {

/// Takes back what a join may have made in the directory. A value; its references outlive it.
struct AccountUndo {
    /// The controller's time from which on an account is this join's own, as a directory writes it.
    /// @param ahead how far the controller's clock is ahead of the host's
    static std::string Begin(std::chrono::seconds ahead);

    /// Whether the controller still answers.
    bool Answers() const;

    /// Deletes the account if this join has made it; needs no secret of it.
    /// @return what stays there, for the log; empty: nothing
    std::string Run(Account const& account) const;

    SambaTools const& tools;
    std::string const& controller;
    std::string const& computer;
    std::string const& begin;
};

} // namespace tessel::winbind
