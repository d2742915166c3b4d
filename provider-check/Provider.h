// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "Recorder.h"

#include <tslauth/tslauth_cam_provider.h>
#include <tslauth/tslauth_provider.h>

#include <string>

namespace tessel::providercheck {

enum class Kind { Unknown, Directory, CAM };

/// A provider's library, opened as libtslauth opens it. Only in a child: what it does then is its
/// own.
class Provider {
public:
    Provider(std::string path, Kind kind);
    Provider(Provider const&) = delete;
    Provider& operator=(Provider const&) = delete;
    ~Provider();

    /// Closes it before its time.
    void Close();

    /// Whether it could be opened; else why not.
    bool IsOpen() const {
        return _library != nullptr;
    }
    std::string const& Failure() const {
        return _failure;
    }

    ActiveDirectoryClientMetadataRecord const* Metadata() const;
    ActiveDirectoryClientOperationsRecord const* Operations() const;
    CAMProxyClientOperationsRecord const* CAMOperations() const;
    /// Null where it has none.
    decltype(&ActiveDirectoryClientLastFailure) LastFailure() const;

    /// How large the library says that a symbol is, in bytes; 0 where it does not say.
    std::size_t SizeOf(char const* symbol) const;

private:
    void* Find(char const* symbol) const;

    void* _library;
    std::string _failure;
};

/// What can be told without a call: the records and what stands in them. Notes the kind of the
/// provider and which of its entries are not null.
void LookAtRecords(std::string const& path, Recorder& recorder);

} // namespace tessel::providercheck
