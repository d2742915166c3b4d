// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_LIBRARYHANDLE_H
#define TSLAUTH_LIBRARYHANDLE_H

#include "Export.h"

#include <memory>

namespace tessel {
namespace authentication {

/// Closes what `dlopen` returned. Only the adapters do, so that only the type is exported.
struct TSLAUTH_EXPORT LibraryCloser {
    __attribute__((visibility("hidden"))) void operator()(void* library) const noexcept;
};

/// A provider's library, loaded as long as its handle lives; empty where there is none. It is a
/// part of the adapters, and nothing that a caller needs.
typedef std::unique_ptr<void, LibraryCloser> LibraryHandle;

} // namespace authentication
} // namespace tessel

#endif
