// SPDX-License-Identifier: Apache-2.0
#include "join/AccountUndo.h"

#include "Failure.h"

#include <array>
#include <ctime>

namespace tessel::winbind {

namespace {

constexpr auto limit = std::chrono::seconds(12);
constexpr auto answerLimit = std::chrono::seconds(3);
/// How much earlier than this join an account must have been made to be somebody else's work.
constexpr auto clockTolerance = std::chrono::seconds(3);

} // namespace

std::string AccountUndo::Begin(std::chrono::seconds ahead) {
    std::time_t const seconds = std::chrono::system_clock::to_time_t(
        std::chrono::system_clock::now() + ahead - clockTolerance);
    std::tm parts = {};
    std::array<char, 32> text = {};
    (void)::gmtime_r(&seconds, &parts); // fails for years that no clock shows
    (void)std::strftime(text.data(), text.size(), "%Y%m%d%H%M%S", &parts);
    return text.data();
}

bool AccountUndo::Answers() const {
    try {
        (void)tools.Lookup(controller, Clock::now() + answerLimit);
        return true;
    } catch (Failure const&) {
        return false;
    }
}

std::string AccountUndo::Run(Account const& account) const {
    std::string const name = "the account '" + computer + "$'";
    auto const deadline = Clock::now() + limit;
    try {
        std::string const made =
            tools.ComputerAttribute(controller, computer, "whenCreated", account, deadline);
        if (made.empty()) {
            return {}; // there is none
        }
        if (made < begin) {
            return name + " was there before, and stays, with another password";
        }
        tools.DeleteAccount(controller, computer, account, deadline);
        return {};
    } catch (Failure const& e) {
        return name + " could not be deleted: " + e.what();
    }
}

} // namespace tessel::winbind
