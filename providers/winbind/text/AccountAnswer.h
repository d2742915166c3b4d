// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string_view>

namespace tessel::winbind {

/// Whether the domain lets a user log in, as `winbind-account` prints it for the PAM module.
enum class AccountAnswer {
    NotOfTheDomain, ///< somebody else's, or the host is not joined
    InOrder,
    Disabled,
    LockedOut,
    Expired,
    OffLine,  ///< no controller answers, and users may log in all the same
    NoAnswer, ///< nobody who knows has said anything
};

/// The one word of an answer.
std::string_view WordOf(AccountAnswer answer);

/// The answer of a word, with which `text` begins and a line ends; nothing for any other text.
std::optional<AccountAnswer> AnswerIn(std::string_view text);

} // namespace tessel::winbind
