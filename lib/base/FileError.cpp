// SPDX-License-Identifier: Apache-2.0
#include "FileError.h"

#include <cstring>
#include <utility>

namespace tessel::base {

std::string SystemText(int error) {
    char buffer[256];
    // The GNU variant: the text is what is returned, in the buffer or not.
    return ::strerror_r(error, buffer, sizeof buffer);
}

FileError::FileError(std::string operation, std::string path, int error)
    : FileError(std::move(operation), std::move(path), SystemText(error)) {
    _error = error;
}

FileError::FileError(std::string operation, std::string path, std::string reason)
    : _operation(std::move(operation)), _path(std::move(path)), _reason(std::move(reason)),
      _text("Cannot " + _operation + " '" + _path + "': " + _reason) {}

FileError::~FileError() = default;

char const* FileError::what() const noexcept {
    return _text.c_str();
}

} // namespace tessel::base
