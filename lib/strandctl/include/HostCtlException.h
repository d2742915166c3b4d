// SPDX-License-Identifier: Apache-2.0
#ifndef STRANDCTL_HOSTCTLEXCEPTION_H
#define STRANDCTL_HOSTCTLEXCEPTION_H

#include "Export.h"

#include <exception>
#include <string>

namespace HostCtl {
namespace Lib {

/// The one failure that the host-control library reports: a text that says what could not be done.
/// A value; copying and destroying are safe from any thread.
class STRANDCTL_EXPORT HostCtlException : public std::exception {
public:
    /// @param text the complete message
    explicit HostCtlException(std::string const& text);

    HostCtlException(HostCtlException const&) = default;
    HostCtlException& operator=(HostCtlException const&) = default;
    ~HostCtlException() noexcept override;

    /// The text. Valid as long as the object is.
    char const* what() const noexcept override;

private:
    std::string _text;
};

} // namespace Lib
} // namespace HostCtl

#endif
