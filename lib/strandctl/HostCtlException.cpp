// SPDX-License-Identifier: Apache-2.0
#include <strandctl/HostCtlException.h>

namespace HostCtl::Lib {

HostCtlException::HostCtlException(std::string const& text) : _text(text) {}

HostCtlException::~HostCtlException() noexcept = default;

char const* HostCtlException::what() const noexcept {
    return _text.c_str();
}

} // namespace HostCtl::Lib
