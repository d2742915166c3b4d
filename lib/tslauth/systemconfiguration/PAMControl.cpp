// SPDX-License-Identifier: Apache-2.0
#include <tslauth/systemconfiguration/PAMControl.h>

#include "Words.h"

namespace SystemConfiguration {

InvalidControlException::InvalidControlException(std::string const& message) : _message(message) {}
InvalidControlException::~InvalidControlException() noexcept = default;

char const* InvalidControlException::what() const noexcept {
    return _message.c_str();
}

PAMControl::PAMControl(std::string const& word) : PAMControl(Words::ControlOf(word)) {}

PAMControl& PAMControl::operator=(std::string const& word) {
    return *this = Words::ControlOf(word);
}

PAMControl& PAMControl::operator=(Control control) {
    _control = control;
    _text.clear();
    return *this;
}

PAMControl::operator std::string() const {
    return std::string(Words::TextOf(*this));
}

bool PAMControl::operator==(PAMControl const& other) const noexcept {
    return _control == other._control && (_control != bracketed || _text == other._text);
}

bool PAMControl::operator==(std::string const& word) const {
    if (_control == bracketed) {
        return _text == word;
    }
    // A bracketed word has a value of its own, so that no copy of its text is needed.
    return !Words::IsBracketed(word) && _control == Words::ValueOf<PAMControl>(word);
}

} // namespace SystemConfiguration
