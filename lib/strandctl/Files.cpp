// SPDX-License-Identifier: Apache-2.0
#include "Files.h"

#include <base/FileError.h>
#include <base/WholeFile.h>
#include <strandctl/HostCtlException.h>

namespace StrandCtl {

namespace {

using HostCtl::Lib::HostCtlException;

template <typename Call> auto Translated(Call call) {
    try {
        return call();
    } catch (tessel::base::FileError const& failure) {
        throw HostCtlException(failure.what());
    }
}

} // namespace

void ThrowSystemError(std::string const& what, int error) {
    throw HostCtlException(what + ": " + tessel::base::SystemText(error));
}

std::optional<std::string> ReadFile(std::string const& path) {
    return Translated([&] { return tessel::base::ReadFile(path); });
}

std::string Destination(std::string const& path) {
    return Translated([&] { return tessel::base::Destination(path); });
}

void ReplaceFile(std::string const& path, std::string_view text) {
    Translated([&] { tessel::base::ReplaceFile(path, text); });
}

} // namespace StrandCtl
