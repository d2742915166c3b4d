// SPDX-License-Identifier: Apache-2.0
#include "history/Confirmation.h"
#include "verbs/HostChange.h"
#include "verbs/Verbs.h"

namespace tessel::tslauthctl {

ExitCode RunConfirm(Console& console) {
    RequireRoot("confirm");
    HostChange const change(console);
    auto const open = OpenConfirmation();
    if (!open) {
        throw Failure(ExitCode::refused, "No change waits to be confirmed");
    }
    ForgetConfirmation();
    console.Document()["number"] = open->number;
    console.Line("Change " + std::to_string(open->number) + " stays.");
    return ExitCode::done;
}

} // namespace tessel::tslauthctl
