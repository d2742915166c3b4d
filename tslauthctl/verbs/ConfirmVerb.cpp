// SPDX-License-Identifier: Apache-2.0
#include "history/Confirmation.h"
#include "verbs/HostChange.h"
#include "verbs/Verbs.h"

namespace tessel::tslauthctl {

namespace {

/// @throws Failure where what is written of it makes no sense; it is forgotten then, since no
///         change would be possible otherwise
std::optional<Confirmation> OpenOrForgotten() {
    try {
        return OpenConfirmation();
    } catch (Failure const& e) {
        ForgetConfirmation();
        throw Failure(ExitCode::failure,
                      std::string(e.what()) + "; it is removed, and what was changed stays");
    }
}

} // namespace

ExitCode RunConfirm(Console& console) {
    RequireRoot("confirm");
    HostChange const change(console);
    auto const open = OpenOrForgotten();
    if (!open) {
        throw Failure(ExitCode::refused, "No change waits to be confirmed");
    }
    ForgetConfirmation();
    console.Document()["number"] = open->number;
    console.Line("Change " + std::to_string(open->number) + " stays.");
    return ExitCode::done;
}

} // namespace tessel::tslauthctl
