// SPDX-License-Identifier: Apache-2.0
#ifndef BENCH_FILES_H
#define BENCH_FILES_H

#include "SystemFile.h"

#include <fcntl.h>
#include <stdexcept>
#include <string>
#include <string_view>
#include <unistd.h>

namespace bench {

/// Makes a file ready for a run, in the plainest way. It is not measured.
inline void WriteFile(std::string const& path, std::string_view text) {
    int const file = ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
    ssize_t const written = ::write(file, text.data(), text.size());
    if (::close(file) != 0 || written != static_cast<ssize_t>(text.size())) {
        throw std::runtime_error("cannot write " + path);
    }
}

/// Whoever is compared must have done the same.
inline void ExpectFile(std::string const& path, std::string_view text) {
    if (tessel::authentication::ReadFile(path) != text) {
        throw std::runtime_error("left another file than ours: " + path);
    }
}

} // namespace bench

#endif
