// SPDX-License-Identifier: Apache-2.0
#include "Failure.h"

#include <utility>

namespace tessel::winbind {

Failure::Failure(ActiveDirectoryClientErrorCode code, std::string text)
    : _code(code), _text(std::move(text)) {}

Failure::~Failure() = default;

char const* Failure::what() const noexcept {
    return _text.c_str();
}

} // namespace tessel::winbind
