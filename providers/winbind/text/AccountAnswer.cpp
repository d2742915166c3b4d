// SPDX-License-Identifier: Apache-2.0
#include "text/AccountAnswer.h"

namespace tessel::winbind {

namespace {

constexpr AccountAnswer all[] = {AccountAnswer::NotOfTheDomain, AccountAnswer::InOrder,
                                 AccountAnswer::Disabled,       AccountAnswer::LockedOut,
                                 AccountAnswer::Expired,        AccountAnswer::OffLine,
                                 AccountAnswer::NoAnswer};

} // namespace

std::string_view WordOf(AccountAnswer answer) {
    switch (answer) {
    case AccountAnswer::NotOfTheDomain:
        return "not-of-the-domain";
    case AccountAnswer::InOrder:
        return "in-order";
    case AccountAnswer::Disabled:
        return "disabled";
    case AccountAnswer::LockedOut:
        return "locked-out";
    case AccountAnswer::Expired:
        return "expired";
    case AccountAnswer::OffLine:
        return "off-line";
    case AccountAnswer::NoAnswer:
        break;
    }
    return "no-answer";
}

std::optional<AccountAnswer> AnswerIn(std::string_view text) {
    std::string_view const line = text.substr(0, text.find('\n'));
    for (AccountAnswer const answer : all) {
        if (line.size() < text.size() && line == WordOf(answer)) {
            return answer;
        }
    }
    return std::nullopt;
}

} // namespace tessel::winbind
