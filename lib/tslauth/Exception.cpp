// SPDX-License-Identifier: Apache-2.0
#include <tslauth/Exception.h>

namespace tessel::authentication {

namespace {

/// "Exception 0x" + eight digits + ": " + text. Written out by hand because a failing provider call
/// is on the path of every timed query, and a string stream costs as much as the throw itself.
std::string CodedMessage(unsigned long code, std::string const& text) {
    static constexpr char digits[] = "0123456789abcdef";
    static constexpr char prefix[] = "Exception 0x";
    std::string message;
    message.reserve(sizeof prefix - 1 + 8 + 2 + text.size());
    message += prefix;
    for (int shift = 28; shift >= 0; shift -= 4) {
        message += digits[(code >> shift) & 0xf];
    }
    message += ": ";
    message += text;
    return message;
}

} // namespace

Exception::Exception(unsigned long code, std::string const& text)
    : _code(code & 0xffffffffUL), _message(CodedMessage(code, text)) {}

Exception::Exception(std::string const& text) : _code(0), _message(text) {}

Exception::~Exception() noexcept = default;

char const* Exception::what() const noexcept {
    return _message.c_str();
}

Exception* Exception::Clone() const {
    return new Exception(*this);
}

void Exception::Throw() const {
    throw Exception(*this);
}

unsigned long Exception::Code() const noexcept {
    return _code;
}

} // namespace tessel::authentication
