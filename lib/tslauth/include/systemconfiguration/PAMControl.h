// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMCONFIGURATION_PAMCONTROL_H
#define TSLAUTH_SYSTEMCONFIGURATION_PAMCONTROL_H

#include "../Export.h"

#include <exception>
#include <string>
#include <utility>

namespace SystemConfiguration {

/// A text that is no control flag of a PAM line, or a control without a text form.
///
/// Not of the family of `tessel::authentication::Exception`: the models of system files stand on
/// their own. The remedy is to repair the file that the text came from.
class TSLAUTH_EXPORT InvalidControlException : public std::exception {
public:
    /// @param message the complete message: "Invalid Control: " followed by the refused text
    explicit InvalidControlException(std::string const& message);

    InvalidControlException(InvalidControlException const&) = default;
    InvalidControlException& operator=(InvalidControlException const&) = default;
    ~InvalidControlException() noexcept override;

    /// The complete message. Valid as long as the object is.
    char const* what() const noexcept override;

private:
    std::string _message;
};

/// The control flag of a PAM line: one of six words, or a list in square brackets that is kept as
/// text. See pam.conf(5) for what each does to the stack.
///
/// A value; one object is used by one thread at a time.
class TSLAUTH_EXPORT PAMControl {
public:
    /// The numbers are part of the interface. `none` is a control that was never set: it has no
    /// text form, and printing it throws.
    enum Control {
        none = 0,
        required = 1,
        requisite = 2,
        sufficient = 3,
        optional = 4,
        include = 5,
        substack = 6,
        bracketed = 7
    };

    PAMControl() noexcept : _control(none) {}
    PAMControl(Control control) noexcept : _control(control) {}

    /// Both as given, unchecked.
    /// @param text the list with its brackets; it counts only together with `bracketed`
    PAMControl(Control control, std::string text) noexcept
        : _control(control), _text(std::move(text)) {}

    /// Parses `word`: a text from "[" to "]" is `bracketed` and is kept, anything else must be one
    /// of the six words, in lower case.
    /// @throws InvalidControlException "Invalid Control: " + `word`
    PAMControl(std::string const& word);

    /// As the constructor of the same argument. On a failure the control stays as it was.
    /// @throws InvalidControlException
    PAMControl& operator=(std::string const& word);

    /// Sets the value and empties the text.
    PAMControl& operator=(Control control);

    operator Control() const noexcept {
        return _control;
    }

    /// The word, or the bracketed text.
    /// @throws InvalidControlException "Invalid Control: " for `none`
    operator std::string() const;

    /// The bracketed text; empty for the six words.
    std::string const& text() const noexcept {
        return _text;
    }

    /// Bracketed controls are equal when their texts are, byte for byte; others when their values
    /// are.
    bool operator==(PAMControl const& other) const noexcept;
    bool operator!=(PAMControl const& other) const noexcept {
        return !(*this == other);
    }

    /// The values alone: `control == PAMControl::bracketed` asks for the form, not for a text.
    bool operator==(Control control) const noexcept {
        return _control == control;
    }
    bool operator!=(Control control) const noexcept {
        return _control != control;
    }

    /// A bracketed control compares its text with `word`. Any other parses `word` first.
    /// @throws InvalidControlException where a word that has to be parsed is unknown; the answer
    /// is not false then
    bool operator==(std::string const& word) const;
    bool operator!=(std::string const& word) const {
        return !(*this == word);
    }

private:
    Control _control;
    std::string _text;
};

inline bool operator==(PAMControl::Control left, PAMControl const& right) noexcept {
    return right == left;
}
inline bool operator!=(PAMControl::Control left, PAMControl const& right) noexcept {
    return right != left;
}
inline bool operator==(std::string const& left, PAMControl const& right) {
    return right == left;
}
inline bool operator!=(std::string const& left, PAMControl const& right) {
    return right != left;
}

} // namespace SystemConfiguration

#endif
