// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_THREADERROR_H
#define TSLAUTH_THREADERROR_H

#include <tslauth/Exceptions.h>

#include <cstddef>
#include <string>

namespace tessel::authentication {

/// "Thread Error: " and `text` from the character at position `error` onward. It looks like a slip
/// and is kept: support tools recognise a failure by what is left of its text. A number beyond the
/// text leaves nothing of it.
template <std::size_t Size>
[[noreturn]] void ThrowThreadError(char const (&text)[Size], int error) {
    std::size_t const position = error < 0 || static_cast<std::size_t>(error) >= Size
                                     ? Size - 1
                                     : static_cast<std::size_t>(error);
    throw ThreadErrorException(std::string("Thread Error: ") + (text + position));
}

} // namespace tessel::authentication

#endif
