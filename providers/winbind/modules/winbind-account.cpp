// SPDX-License-Identifier: Apache-2.0
// Prints whether the domain lets a user log in. A program of its own, so that a log-in can end it:
// what it asks may hang.
#include "modules/AccountBounds.h"
#include "questions/AccountCheck.h"
#include "samba/ThisHost.h"

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <unistd.h>

using namespace tessel::winbind;

int main(int count, char** arguments) {
    if (count != 2) {
        (void)std::fputs("usage: winbind-account USER\n", stderr);
        return EXIT_FAILURE;
    }
    // Below `su` the real user is who has called it, and programs look at that.
    if (::geteuid() == 0 && (::setresgid(0, 0, 0) != 0 || ::setresuid(0, 0, 0) != 0)) {
        std::perror("winbind-account: cannot become root");
        return EXIT_FAILURE;
    }
    AccountAnswer const answer =
        AskAboutAccount(ThisHost(), arguments[1], Clock::now() + AccountBounds::Question);
    std::string const line = std::string(WordOf(answer)) + '\n';
    (void)std::fputs(line.c_str(), stdout); // the flush tells
    return std::fflush(stdout) == 0 ? EXIT_SUCCESS : EXIT_FAILURE;
}
