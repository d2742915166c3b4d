// SPDX-License-Identifier: Apache-2.0
#include "SystemFile.h"

#include <base/WholeFile.h>
#include <cerrno>
#include <tslauth/AtomicFileStream.h>
#include <tslauth/Exceptions.h>

namespace tessel::authentication {

namespace {

base::ReadableFile Opened(std::string const& path, char const* openFailure) {
    try {
        return base::ReadableFile(path);
    } catch (base::FileError const& failure) {
        throw IOError(openFailure + (" '" + path + "': ") + failure.Reason());
    }
}

} // namespace

void ThrowIOError(std::string const& what, int error) {
    throw IOError(what + ": " + SystemText(error));
}

std::string ReadFile(std::string const& path, char const* openFailure, OnReadError onReadError) {
    base::ReadableFile const file = Opened(path, openFailure);
    if (onReadError == OnReadError::EndQuietly && (file.IsRegular() || file.IsFolder())) {
        return file.TextUpToAnError();
    }
    try {
        return file.Text();
    } catch (base::FileError const& failure) {
        throw IOError(failure.what());
    }
}

void ReplaceFile(std::string const& path, std::string_view text) {
    AtomicFileStream stream(path.c_str(), std::ios::out);
    if (!stream) {
        int const error = errno;
        ThrowIOError("Cannot open '" + path + "'", error);
    }
    stream.write(text.data(), static_cast<std::streamsize>(text.size()));
    stream.Sync();
    stream.Commit();
}

} // namespace tessel::authentication
