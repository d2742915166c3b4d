// SPDX-License-Identifier: Apache-2.0
// What the PAM module asks of the domain. A program of its own, so that a log-in can end it: what
// it asks may hang.
//
//   winbind-account USER      prints whether the domain lets the user log in
//   winbind-account --reach   tells winbindd whether a controller can be reached, where it matters
#include "host/SystemLog.h"
#include "modules/AccountBounds.h"
#include "questions/AccountCheck.h"
#include "questions/OffLine.h"
#include "samba/Reachability.h"
#include "samba/ThisHost.h"

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <string>
#include <unistd.h>

using namespace tessel::winbind;

namespace {

int LookForControllers() {
    auto const deadline = Clock::now() + AccountBounds::Question;
    try {
        TellWinbinddOfControllers(
            ThisHost(),
            [](std::string const& domain) {
                return IsReachable(ThisHost(), domain, Clock::now() + AccountBounds::Look);
            },
            deadline);
        return EXIT_SUCCESS;
    } catch (std::exception const& failure) {
        LogWarning(failure.what());
        return EXIT_FAILURE;
    }
}

int Check(char const* user) {
    AccountAnswer const answer =
        AskAboutAccount(ThisHost(), user, Clock::now() + AccountBounds::Question);
    std::string const line = std::string(WordOf(answer)) + '\n';
    (void)std::fputs(line.c_str(), stdout); // the flush tells
    return std::fflush(stdout) == 0 ? EXIT_SUCCESS : EXIT_FAILURE;
}

} // namespace

int main(int count, char** arguments) {
    if (count != 2) {
        (void)std::fputs("usage: winbind-account USER | --reach\n", stderr);
        return EXIT_FAILURE;
    }
    // Below `su` the real user is who has called it, and programs look at that.
    if (::geteuid() == 0 && (::setresgid(0, 0, 0) != 0 || ::setresuid(0, 0, 0) != 0)) {
        std::perror("winbind-account: cannot become root");
        return EXIT_FAILURE;
    }
    return arguments[1] == std::string("--reach") ? LookForControllers() : Check(arguments[1]);
}
