// SPDX-License-Identifier: Apache-2.0
#include "analysis/HostFile.h"

#include <tslauth/Exceptions.h>

#include <base/FileError.h>
#include <base/WholeFile.h>
#include <cerrno>

namespace tessel::tslauthctl {

std::string ReadHostFile(std::string const& path) {
    try {
        if (auto text = base::ReadFile(path)) {
            return std::move(*text);
        }
        throw base::FileError("open", path, ENOENT);
    } catch (base::FileError const& e) {
        throw authentication::IOError(e.what());
    }
}

std::optional<std::string> HostFileOrNothing(std::string const& path) {
    try {
        return base::ReadFile(path);
    } catch (base::FileError const&) {
        return std::nullopt;
    }
}

} // namespace tessel::tslauthctl
